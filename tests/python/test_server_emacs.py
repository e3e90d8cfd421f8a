"""The language server in Emacs with Eglot, set up as docs/editors.md says. Emacs runs a program of its own without a
terminal, and writes down what it saw.
"""

from __future__ import annotations

import json
import os
import re
import shutil
import subprocess
import sys
from typing import Any

import pytest

from editing import EDITORS, MAIN, SHOP

pytest.importorskip("pygls")
EMACS = shutil.which("emacs")
HAS_EGLOT = (
    EMACS is not None
    and subprocess.run([EMACS, "--batch", "-l", "eglot"], capture_output=True, timeout=60, check=False).returncode == 0
)
if not HAS_EGLOT:
    pytest.skip("needs Emacs with Eglot (Debian: apt-get install emacs-nox elpa-eglot)", allow_module_level=True)

SCRIPT = r"""
(require 'json)
(require 'flymake)
(require 'eglot)
(setq make-backup-files nil auto-save-default nil create-lockfiles nil
      eglot-connect-timeout 60 eglot-sync-connect 60)
%s
(defvar seen nil)
(defun keep (name value) (push (cons name value) seen))
(defun wait-for (question)
  "Asks until there is an answer, a minute at most."
  (let ((deadline (+ (float-time) 60)) answer)
    (while (not (or (setq answer (funcall question)) (> (float-time) deadline)))
      (accept-process-output nil 0.05))
    answer))
(defun text () (buffer-substring-no-properties (point-min) (point-max)))
(defun at (line column) (goto-char (point-min)) (forward-line (1- line)) (move-to-column column))
(defun shown (item)
  (let ((at (xref-item-location item)))
    (format "%%s:%%d:%%d" (file-name-nondirectory (xref-location-group at)) (xref-location-line at)
            (xref-file-location-column at))))

(find-file "main.py")
(run-hooks 'post-command-hook)
(keep "is managed" (if (wait-for #'eglot-managed-p) t :json-false))
(at 4 0)
(keep "references" (vconcat (mapcar #'shown (xref-backend-references 'eglot ""))))
(let (said)
  (eglot-hover-eldoc-function (lambda (text &rest _) (setq said text)))
  (wait-for (lambda () said))
  (keep "hover" (and said (substring-no-properties said))))
(call-interactively #'xref-find-definitions)
(keep "definition" (vector (file-name-nondirectory (buffer-file-name)) (line-number-at-pos) (current-column)))

(switch-to-buffer "main.py")
(goto-char (point-max))
(insert "corner.to")
(keep "offered" (vconcat (mapcar #'substring-no-properties (all-completions "to" (nth 2 (eglot-completion-at-point))))))
(completion-at-point)
(keep "completed" (buffer-substring-no-properties (line-beginning-position) (line-end-position)))
(insert "()\nmissing_name\n")
(eglot--signal-textDocument/didChange)
(flymake-start)
(wait-for #'flymake-diagnostics)
(keep "problems"
      (vconcat (mapcar (lambda (each)
                         (vector (line-number-at-pos (flymake-diagnostic-beg each)) (flymake-diagnostic-text each)))
                       (flymake-diagnostics))))
(at 4 0)
(eglot-rename "settle")
(keep "renamed" (text))
(keep "renamed elsewhere" (with-current-buffer "shop.py" (text)))
(call-interactively #'eglot-shutdown)
(with-temp-file "seen.json" (insert (json-encode seen)))
"""


def set_up() -> str:
    """The Lisp of the document."""
    text = EDITORS.read_text(encoding="utf-8")
    [lisp] = re.findall(r"```elisp\n(.*?)```", text, re.DOTALL)
    command = " ".join(json.dumps(part) for part in (sys.executable, "-m", "quillet", "serve"))
    return str(lisp).replace('"quillet" "serve"', command)


@pytest.fixture(scope="module")
def seen(tmp_path_factory: pytest.TempPathFactory) -> dict[str, Any]:
    folder = tmp_path_factory.mktemp("emacs").resolve()
    (folder / "shop.py").write_text(SHOP)
    (folder / "main.py").write_text(MAIN)
    (folder / "drive.el").write_text(SCRIPT % set_up())
    done = subprocess.run(
        [str(EMACS), "--batch", "--no-init-file", "-l", "drive.el"],
        cwd=folder,
        env={**os.environ, "HOME": str(folder), "VIRTUAL_ENV": ""},
        capture_output=True,
        text=True,
        timeout=300,
        check=False,
    )
    assert (folder / "seen.json").is_file(), done.stderr
    found: dict[str, Any] = json.loads((folder / "seen.json").read_text())
    assert found["is managed"] is True
    return found


def test_definition_and_references(seen: dict[str, Any]) -> None:
    assert seen["definition"] == ["shop.py", 6, 4]
    assert sorted(seen["references"]) == ["main.py:1:23", "main.py:4:0", "shop.py:6:4"]


def test_hover(seen: dict[str, Any]) -> None:
    assert "def pay(shop: Shop)" in seen["hover"]


def test_completion(seen: dict[str, Any]) -> None:
    assert seen["offered"] == ["total"]
    assert seen["completed"] == "corner.total"


def test_problems_behind_a_change(seen: dict[str, Any]) -> None:
    [(line, said)] = seen["problems"]
    assert line == 7
    assert "nothing binds the name 'missing_name'" in said


def test_rename_changes_all_buffers(seen: dict[str, Any]) -> None:
    assert seen["renamed"].splitlines()[:4] == [
        "from shop import Shop, settle",
        "",
        "corner = Shop()",
        "settle(corner)",
    ]
    assert "def settle(shop: Shop):" in seen["renamed elsewhere"]
