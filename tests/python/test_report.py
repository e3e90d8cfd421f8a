"""The site of a folder: its links lead somewhere, its texts stay texts, and a browser runs it from disk."""

from __future__ import annotations

import json
import os
import re
import subprocess
from collections.abc import Iterator
from html import unescape
from html.parser import HTMLParser
from pathlib import Path
from random import Random

import pytest

from browser import Browser, Page
from indexing import COMMAND, ENVIRONMENT, ODD_NAMES, SHOP, run
from quillet.report import folder as report_folder
from quillet.report import site as report_site
from quillet.report.folder import SiteProblem
from quillet.report.site import Reports, Settings, Source, write_site
from quillet.tarvex import _host

ATTACK = "</code><script>document.title = 'broken'</script>"
ROLES = ("definition", "write", "read", "call", "delete", "import", "keyword", "declaration")


class Html(HTMLParser):
    """The tags of a page with their attributes, and the text of each link."""

    def __init__(self, path: Path) -> None:
        super().__init__()
        self.tags: list[tuple[str, dict[str, str | None]]] = []
        self.texts: dict[int, str] = {}
        self._open = False
        self.feed(path.read_text(encoding="utf-8"))

    def handle_starttag(self, tag: str, attributes: list[tuple[str, str | None]]) -> None:
        self.tags.append((tag, dict(attributes)))
        self._open = True

    def handle_endtag(self, tag: str) -> None:
        self._open = False

    def handle_data(self, data: str) -> None:
        if not self._open:
            return
        place = len(self.tags) - 1
        self.texts[place] = self.texts.get(place, "") + data

    def links(self, text: str) -> list[dict[str, str | None]]:
        """The links of names with this text."""
        return [
            attributes
            for place, (tag, attributes) in enumerate(self.tags)
            if tag == "a" and self.texts.get(place) == text and ("data-n" in attributes or "data-s" in attributes)
        ]

    def targets(self, text: str) -> list[str | None]:
        return [link["href"] for link in self.links(text)]


def write_files(folder: Path, **files: str) -> None:
    for name, text in files.items():
        (folder / f"{name}.py").write_text(text, encoding="utf-8")


def make_report(folder: Path, **files: str) -> Path:
    """Writes `name.py` for each keyword, and the site of the folder."""
    write_files(folder, **files)
    result = run("report", "-o", "site", cwd=folder)
    assert result.returncode == 0, result.stderr
    return folder / "site"


def page_of(folder: Path, **files: str) -> Html:
    """The page of the first file."""
    return Html(make_report(folder, **files) / "files" / "0.html")


def taken(script: Path) -> list[object]:
    """What a data script hands to the page."""
    text = script.read_text(encoding="ascii")
    assert text.startswith("quillet.take(")
    assert text.endswith(");\n")
    body = re.sub(r"(?m)([{,]|^)(\d+):", r'\1"\2":', text[len("quillet.take(") : -3])
    return json.loads(f"[{body}]")


def places_of(site: Path, name: str) -> dict[str, list[tuple[str, int, int]]]:
    """What the panel of a name lists: by role the places, as (file, line, column)."""
    [files] = taken(site / "data" / "files.js")
    found: dict[str, list[tuple[str, int, int]]] = {}
    for script in (site / "data").glob("[0-9]*.js"):
        [names] = taken(script)
        for text, counts, _, groups in names.values():
            if text != name:
                continue
            for file, *numbers in groups:
                for line, column, code in zip(numbers[::3], numbers[1::3], numbers[2::3], strict=True):
                    role = "parameter" if code == 3 << 4 else ROLES[code & 7]
                    found.setdefault(role, []).append((files[file], line, column))
            assert counts == [len(found.get(role, ())) for role in (*ROLES, "parameter")]
    return found


def definitions_of(site: Path) -> dict[str, str]:
    """What the search knows: the letters of the kinds by name."""
    [_, names] = taken(site / "data" / "names.js")
    return {name: kinds for name, kinds, *_ in names}


def content_of(site: Path) -> dict[str, bytes]:
    return {str(path.relative_to(site)): path.read_bytes() for path in site.rglob("*") if path.is_file()}


# ---- what pages say ----


def test_every_link_leads_somewhere(tmp_path: Path) -> None:
    site = make_report(tmp_path, shop=SHOP, other="from shop import Shop\nShop().add(1)\n", bad="x = = 1\n")
    pages = {path: Html(path) for path in site.rglob("*.html")}
    assert len(pages) == 4
    anchors = {path: {attributes.get("id") for _, attributes in page.tags} for path, page in pages.items()}
    count = 0
    for path, page in pages.items():
        for tag, attributes in page.tags:
            target = attributes.get("href") or attributes.get("src")
            if tag not in ("a", "link", "script") or target is None:
                continue
            file, _, anchor = target.partition("#")
            at = (path.parent / file).resolve() if file else path
            assert at.is_file(), target
            assert site in at.parents
            assert not anchor or anchor in anchors[at], target
            count += 1
    assert count > 90


def test_a_name_leads_to_its_definition(tmp_path: Path) -> None:
    page = page_of(tmp_path, shop=SHOP)
    assert page.targets("Item") == ["#L7", "#L7", "#L7"]
    assert page.targets("name") == ["#L20", "#L20"]
    assert page.targets("item") == ["#L15", "#L15"]
    assert page.targets("self")[:2] == ["#L10", "#L10"]


def test_a_local_name_leads_to_its_own_scope(tmp_path: Path) -> None:
    source = "def one(value):\n    return value\n\n\ndef two():\n    value = 1\n    return value\n\n\nvalue = 3\n"
    page = page_of(tmp_path, a=source)
    assert page.targets("value") == ["#L1", "#L1", "#L6", "#L6", "#L10"]
    one, _, two, _, outer = page.links("value")
    assert len({one["data-s"], two["data-s"], outer["data-s"]}) == 3


def test_a_name_of_another_file_leads_there(tmp_path: Path) -> None:
    page = page_of(tmp_path, a="import b\nb.work(1)\n", b="x = 1\n\ndef work(n): return n\n")
    assert page.targets("work") == ["1.html#L3"]


def test_what_is_defined_more_than_once_leads_to_no_one_of_them(tmp_path: Path) -> None:
    source = "class A:\n    def run(self): pass\n\n\nclass B:\n    def run(self): pass\n\n\nx.run()\n"
    assert page_of(tmp_path, a=source).targets("run") == ["#L2", "#L6", "#L9"]


def test_a_link_to_another_file_is_what_is_imported(tmp_path: Path) -> None:
    source = "import os\nfrom c import work\nos.path\nwork()\nx.join()\nx.rest()\n"
    page = page_of(tmp_path, a=source, b="def path(): pass\ndef work(): pass\ndef join(): pass\ndef rest(): pass\n")
    assert page.targets("path") == ["#L3"]  # of a module that is not here
    assert page.targets("work") == ["#L2", "#L2"]
    assert page.targets("join") == ["#L5"]  # what values of the language's own types have
    assert page.targets("rest") == ["1.html#L4"]


def test_the_path_of_an_import_leads_to_its_page(tmp_path: Path) -> None:
    (tmp_path / "pkg").mkdir()
    (tmp_path / "pkg" / "__init__.py").write_text("")
    (tmp_path / "pkg" / "shop.py").write_text("class Shop: pass\n")
    page = page_of(tmp_path, a="from pkg.shop import Shop\nimport pkg\nimport gone\n")
    assert page.targets("pkg") == ["1.html", "1.html"]
    assert page.targets("shop") == ["2.html"]
    assert page.targets("Shop") == ["2.html#L1"]
    assert page.targets("gone") == ["#L3"]


def test_a_star_import_may_have_brought_a_name(tmp_path: Path) -> None:
    page = page_of(tmp_path, a="from b import *\nwork()\nlen()\n", b="def work(): pass\n")
    assert page.targets("work") == ["1.html#L1"]
    assert page.links("len") == []


def test_every_occurrence_is_a_link(tmp_path: Path) -> None:
    source = (
        "def f(x, *, y: 'Shop' = 1):\n    # type: (int) -> f\n    return f'{x + y!r:>{x}}' + f(x, y=y)\n\n"
        "class Shop(f):\n    y = [y for y in y if y]\n    @f\n    def g(self, y: y): return (y := y)\n"
    )
    page = page_of(tmp_path, a=source)
    assert page.targets("x") == ["#L1"] * 4
    assert len(page.links("y")) == 13
    assert page.targets("f") == ["#L1"] * 5
    assert page.targets("Shop") == ["#L5", "#L5"]
    assert {link["class"] for link in page.links("y")} == {"d param", "r", "k", "d", "w"}


def test_names_of_a_broken_statement_are_links(tmp_path: Path) -> None:
    source = (
        "class A:\n    def f(self, item:\n        item.price = total(item\n\n"
        "    def g(self):\n        self.f(\n\ndef total(x): pass\n"
    )
    site = make_report(tmp_path, a=source)
    page = Html(site / "files" / "0.html")
    assert page.targets("total") == ["#L8", "#L8"]
    assert page.targets("f")[0] == "#L2"
    assert ("a.py", 3, 22) in places_of(site, "total")["call"]
    assert '<a href="#L2"><i>def</i> f</a>' in (site / "files" / "0.html").read_text()


def test_keyword_arguments_are_listed_with_parameters(tmp_path: Path) -> None:
    site = make_report(tmp_path, a="def f(using): return using\n", b="f(using=1)\nx.using\n")
    places = places_of(site, "using")
    assert places["keyword"] == [("b.py", 1, 3)]
    assert places["parameter"] == [("a.py", 1, 7)]
    assert "definition" not in places


def test_builtins_lead_nowhere_but_to_a_definition_of_the_module(tmp_path: Path) -> None:
    site = make_report(
        tmp_path, a="len(print)\n", b="def len(x): pass\n\n\nlen(1)\nclass C:\n    def print(self): pass\n"
    )
    assert Html(site / "files" / "0.html").links("len") == []
    assert Html(site / "files" / "0.html").links("print") == []
    assert Html(site / "files" / "1.html").targets("len") == ["#L1", "#L1"]


def test_a_methods_uses_are_listed_with_its_definitions(tmp_path: Path) -> None:
    calls = "".join(f"def f{n}(shop):\n    return shop.add({n}, count={n}) + g(shop.add())\n" for n in range(49))
    site = make_report(tmp_path, shop=SHOP, calls=calls, uses="keep = Shop.add\n")
    places = places_of(site, "add")
    assert places["definition"] == [("shop.py", 15, 9)]
    assert len(places["call"]) == 98 + 1
    assert places["call"][:2] == [("calls.py", 2, 17), ("calls.py", 2, 42)]
    assert places["read"] == [("uses.py", 1, 13)]


def test_imports_are_no_definitions(tmp_path: Path) -> None:
    site = make_report(tmp_path, shop=SHOP, a="from shop import Shop\nShop()\n", b="from shop import Shop\n")
    places = places_of(site, "Shop")
    assert places["definition"] == [("shop.py", 14, 7)]
    assert places["import"] == [("a.py", 1, 18), ("b.py", 1, 18)]
    assert places["call"] == [("a.py", 2, 1), ("shop.py", 25, 12)]
    assert definitions_of(site)["Shop"] == "c"
    assert "os" not in definitions_of(site)
    assert definitions_of(site)["price"] == "va"


def test_hints_and_values_are_known_of_a_name(tmp_path: Path) -> None:
    page = page_of(tmp_path, shop=SHOP)
    assert page.links("item")[0]["data-tip"] == ": Item"
    assert page.links("LIMIT")[0]["data-tip"] == ": int  = int: 10"
    assert page.links("D")[0]["data-tip"] == "from decimal import Decimal"
    assert page.links("os")[0]["data-tip"] == "import os"


def test_errors_stand_below_their_line_and_on_the_front_page(tmp_path: Path) -> None:
    site = make_report(tmp_path, a="x = 1\ny = = 2\n")
    page = (site / "files" / "0.html").read_text()
    assert '<p id="L2" class="bad">' in page
    assert '<p class="error">    ^ invalid syntax</p>' in page
    assert '<a href="files/0.html#L2">a.py:2:5</a> invalid syntax' in (site / "index.html").read_text()


def test_every_line_of_the_source_is_there(tmp_path: Path) -> None:
    source = (
        'x = """a\n\n  # no comment\n"""  # comment\nif x:\r\n\tpass\ny = \'é\' + f"{x}"\nz = """open\nto the end\\'
    )
    (tmp_path / "a.py").write_bytes(source.encode())
    page = (make_report(tmp_path) / "files" / "0.html").read_text()
    lines = re.findall(r'<p id="L\d+"[^>]*><a[^>]*>\d+</a>(.*?)</p>\n', page)
    assert [unescape(re.sub(r"<[^>]*>", "", line)) for line in lines] == re.split("\r\n|\n", source)
    assert '<b class="s">  # no comment</b>' in page
    assert '<b class="c"># comment</b>' in page
    assert '<b class="k">if</b>' in page


def test_the_first_page_shows_folders(tmp_path: Path) -> None:
    (tmp_path / "deep" / "down").mkdir(parents=True)
    (tmp_path / "deep" / "down" / "a.py").write_text("x = 1\n")
    (tmp_path / "b.py").write_text("x = = 1\n")
    front = (make_report(tmp_path) / "index.html").read_text()
    assert "<summary><span>deep/down/</span>" in front
    assert '<a href="files/1.html"><span>a.py</span>' in front
    assert "<strong>2</strong> files" in front


def test_source_and_file_names_stay_text(tmp_path: Path) -> None:
    for name in [*ODD_NAMES, "<img src=x onerror=alert(1)>.py"]:
        (tmp_path / os.fsdecode(name)).write_text(
            f"x = {ATTACK!r}\ny: {ATTACK!r} = '\x00\x1b\u202e'\nz = = \"{ATTACK}\n"
        )
    site = make_report(tmp_path)
    allowed = {"html", "head", "meta", "title", "link", "script", "body", "header", "a", "span", "div", "input", "kbd"}
    allowed |= {
        "ul",
        "li",
        "p",
        "nav",
        "h2",
        "i",
        "b",
        "em",
        "main",
        "section",
        "strong",
        "details",
        "summary",
        "small",
    }
    for path in site.rglob("*.html"):
        page = Html(path)
        assert {tag for tag, _ in page.tags} <= allowed
        assert sum(tag == "script" for tag, _ in page.tags) == 1
        assert not any(key.startswith("on") for _, attributes in page.tags for key in attributes)
        assert not re.search("[\x00-\x08\x0b-\x1f\x7f\u202e]", path.read_text())
    assert len(list((site / "files").glob("*.html"))) == 8


def test_the_site_loads_nothing_from_elsewhere(tmp_path: Path) -> None:
    site = make_report(tmp_path, shop=SHOP)
    for path in site.rglob("*.*"):
        if path.is_file():
            assert not re.search(r"https?:|@import|url\(", path.read_text()), path


def test_a_file_that_cannot_be_read_is_named(tmp_path: Path) -> None:
    write_files(tmp_path, a="x = 1\n", b="# coding: no-such\n")
    result = run("report", "-o", "site", cwd=tmp_path)
    assert result.returncode == 1
    assert "b.py: cannot read the source as 'no-such'" in result.stderr
    assert "could not be read as Python" in (tmp_path / "site" / "files" / "1.html").read_text()


def test_endless_lines_and_files_are_shown_in_part(tmp_path: Path) -> None:
    write_files(tmp_path, a="x = [" + "abc.d, " * 30_000 + "]\nabc = 1\n", b=f"y = 1\n# {'c' * 98}\n" * 90_000)
    result = run("report", "-o", "site", cwd=tmp_path)
    assert result.returncode == 0
    assert "a.py: has endless lines, of which its page shows the first 10000 bytes\n" in result.stderr
    assert "b.py: too large for a page, which shows the first 4 MB\n" in result.stderr
    assert len(result.stderr.splitlines()) == 3
    page = (tmp_path / "site" / "files" / "0.html").read_text()
    assert "… and 200006 more bytes</em>" in page
    assert 'id="L2"' in page
    page = (tmp_path / "site" / "files" / "1.html").read_text()
    assert re.search(r"… and \d+ more lines, which a page does not show", page)
    assert 5_000_000 > (tmp_path / "site" / "files" / "1.js").stat().st_size > 4_000_000


def test_names_that_occur_without_end_are_counted(tmp_path: Path) -> None:
    site = make_report(tmp_path, a="x.total()\n" * 600 + "x.total\n")
    [names] = taken(site / "data" / "0.js")
    [(_, counts, _, groups)] = [entry for entry in names.values() if entry[0] == "total"]
    assert counts[ROLES.index("call")] == 600
    assert counts[ROLES.index("read")] == 1
    assert [len(numbers) // 3 for numbers in groups] == [501]


# ---- which files, and where to ----


def test_files_and_folders_are_named(tmp_path: Path) -> None:
    for folder in ("src", "tests", "other"):
        (tmp_path / folder).mkdir()
        (tmp_path / folder / "a.py").write_text("x = 1\n")
    assert run("report", "src", "tests/a.py", "./src", "-o", "site", cwd=tmp_path).returncode == 0
    assert taken(tmp_path / "site" / "data" / "files.js") == [["src/a.py", "tests/a.py"]]


def test_a_link_that_leads_out_is_left_out(tmp_path: Path) -> None:
    (tmp_path / "src").mkdir()
    (tmp_path / "secret.py").write_text("key = 'secret'\n")
    (tmp_path / "src" / "a.py").write_text("x = 1\n")
    (tmp_path / "src" / "b.py").symlink_to("../secret.py")
    result = run("report", "src", "-o", "site", cwd=tmp_path)
    assert "secret" not in b"".join(content_of(tmp_path / "site").values()).decode()
    assert taken(tmp_path / "site" / "data" / "files.js") == [["src/a.py"]]
    assert result.returncode in (0, 1)


def test_what_others_planted_is_not_read(tmp_path: Path) -> None:
    (tmp_path / "src").mkdir()
    (tmp_path / "secret.py").write_text("key = 1\n")
    (tmp_path / "secret.py").rename(tmp_path / "secret.py")
    run("index", str(tmp_path / "secret.py"), "-o", "src/.quillet-index", cwd=tmp_path)
    (tmp_path / "src" / "a.py").write_text("x = 1\n")
    make_report(tmp_path / "src")
    assert taken(tmp_path / "src" / "site" / "data" / "files.js") == [["a.py"]]


def test_nothing_is_written_outside_the_folder(tmp_path: Path) -> None:
    (tmp_path / "source").mkdir()
    write_files(tmp_path / "source", shop=SHOP)
    assert run("report", "-o", "../site", cwd=tmp_path / "source").returncode == 0
    assert {path.name for path in (tmp_path / "source").iterdir()} == {"shop.py"}
    assert {path.name for path in tmp_path.iterdir()} == {"source", "site"}
    assert {path.name for path in (tmp_path / "site").iterdir()} == {*report_folder.ENTRIES, ".quillet-report"}


def test_nothing_to_show_is_wrong_usage(tmp_path: Path) -> None:
    for arguments in ([], ["-"]):
        result = run("report", *arguments, "-o", "site", cwd=tmp_path)
        assert result.returncode == 2
        assert len(result.stderr.splitlines()) == 1
    assert list(tmp_path.iterdir()) == []


def test_a_folder_that_holds_something_else_is_left_alone(tmp_path: Path) -> None:
    write_files(tmp_path, a="x = 1\n")
    (tmp_path / "mine").mkdir()
    (tmp_path / "mine" / "thesis.txt").write_text("text")
    for name in ("mine", "a.py"):
        result = run("report", "-o", name, cwd=tmp_path)
        assert result.returncode == 2
        assert re.search("holds something else|is no folder", result.stderr)
    assert [path.name for path in (tmp_path / "mine").iterdir()] == ["thesis.txt"]


def test_links_in_the_folder_are_not_followed(tmp_path: Path) -> None:
    site = make_report(tmp_path, a="x = 1\n")
    elsewhere = tmp_path / "elsewhere"
    elsewhere.mkdir()
    (elsewhere / "kept").write_text("kept")
    for name in ("files", ".new", ".old"):
        if (site / name).exists():
            report_folder._remove(site / name)
        (site / name).symlink_to(elsewhere)
    make_report(tmp_path)
    assert [path.name for path in elsewhere.iterdir()] == ["kept"]
    assert not (site / "files").is_symlink()
    report_folder._remove(site)
    site.mkdir()
    (site / ".quillet-report").symlink_to(elsewhere / "mark")
    assert run("report", "-o", "site", cwd=tmp_path).returncode == 2
    assert not (elsewhere / "mark").exists()


def test_a_second_report_replaces_the_first_and_keeps_the_rest(tmp_path: Path) -> None:
    site = make_report(tmp_path, a="x = 1\n", b="y = 1\n")
    (site / "CNAME").write_text("example")
    (tmp_path / "b.py").unlink()
    make_report(tmp_path)
    assert sorted(path.name for path in (site / "files").iterdir()) == ["0.html", "0.js"]
    assert (site / "CNAME").read_text() == "example"


# ---- runs that end early ----


class Stop(Exception):
    pass


def reports_that_stop(at: int) -> Reports:
    steps = iter(range(at))

    def advance() -> None:
        if next(steps, None) is None:
            raise Stop

    return Reports(unread=lambda *_: None, cut=lambda *_: None, begin=lambda *_: None, advance=advance)


@pytest.mark.parametrize("steps", [0, 1, 2, 3])
def test_a_run_that_ends_early_leaves_what_was_there(tmp_path: Path, steps: int) -> None:
    site = make_report(tmp_path, a="x = 1\n", b="y = 1\n")
    before = content_of(site)
    sources = [Source(str(tmp_path / "a.py"), "a.py"), Source(str(tmp_path / "b.py"), "c.py")]
    with pytest.raises(Stop):
        write_site(sources, str(site), Settings(), reports_that_stop(steps))
    assert content_of(site) == before
    with pytest.raises(Stop):
        write_site(sources, str(tmp_path / "new"), Settings(), reports_that_stop(steps))
    assert not (tmp_path / "new").exists()
    (tmp_path / "empty").mkdir()
    with pytest.raises(Stop):
        write_site(sources, str(tmp_path / "empty"), Settings(), reports_that_stop(steps))
    assert list((tmp_path / "empty").iterdir()) == []


@pytest.mark.parametrize("renames", range(10))
def test_the_old_site_comes_back_where_the_new_one_cannot_take_its_place(
    tmp_path: Path, monkeypatch: pytest.MonkeyPatch, renames: int
) -> None:
    site = make_report(tmp_path, a="x = 1\n")
    before = content_of(site)
    real = os.rename
    calls = iter(range(renames))

    def rename(source: Path, target: Path) -> None:
        if ".old" not in Path(source).parts and next(calls, None) is None:
            raise OSError(28, "No space left on device")
        real(source, target)

    monkeypatch.setattr(report_folder.os, "rename", rename)
    (tmp_path / "a.py").write_text("changed = 1\n")
    with pytest.raises(OSError, match="No space"):
        write_site([Source(str(tmp_path / "a.py"), "a.py")], str(site), Settings(), reports_that_stop(9))
    assert content_of(site) == before


def test_what_a_killed_run_left_is_cleared_away(tmp_path: Path) -> None:
    site = make_report(tmp_path, a="x = 1\n")
    for name in (".new", ".old"):
        (site / name / "files").mkdir(parents=True)
    make_report(tmp_path)
    assert {path.name for path in site.iterdir()} == {*report_folder.ENTRIES, ".quillet-report"}


def test_two_runs_keep_out_of_each_others_way(tmp_path: Path) -> None:
    pytest.importorskip("fcntl")
    site = make_report(tmp_path, a="x = 1\n")
    with report_folder.new_site(str(site)) as new:
        with pytest.raises(SiteProblem, match="another run"), report_folder.new_site(str(site)):
            pass
        assert new.is_dir()
        for name in report_folder.ENTRIES:
            (new / name).touch()
    assert (site / "index.html").read_bytes() == b""


@pytest.mark.skipif(os.name != "posix", reason="limits a process's files")
def test_a_full_device_is_one_clear_line(tmp_path: Path) -> None:
    site = make_report(tmp_path, a="x = 1\n" * 10_000)
    before = content_of(site)
    limited = ["sh", "-c", 'ulimit -f 100; exec "$@"', "sh", *COMMAND, "report", "-o", "site"]
    result = subprocess.run(limited, cwd=tmp_path, env=ENVIRONMENT, capture_output=True, timeout=120, check=False)
    assert result.returncode == 2
    assert result.stderr.decode() == "quillet: site: File too large\n"
    assert content_of(site) == before


# ---- how it is made ----


def test_the_site_is_the_same_at_any_number_of_threads_and_with_any_spill(
    tmp_path: Path, monkeypatch: pytest.MonkeyPatch
) -> None:
    sources = []
    for number in range(40):
        (tmp_path / f"{number}.py").write_text(SHOP + "".join(f"x.many{n % 400}(f.g)\n" for n in range(300)))
        sources.append(Source(str(tmp_path / f"{number}.py"), f"{number}.py"))
    reports = reports_that_stop(1000)
    contents = []
    for jobs, waiting in ((1, 1 << 20), (8, 0), (3, 5000)):
        monkeypatch.setattr(report_site, "_MOST_WAITING", waiting)
        assert write_site(sources, str(tmp_path / "site"), Settings(jobs=jobs), reports) == 0
        contents.append(content_of(tmp_path / "site"))
    assert contents[0] == contents[1] == contents[2]
    assert len(list((tmp_path / "site" / "data").glob("[0-9]*.js"))) > 1


def test_pages_of_broken_sources_are_whole(tmp_path: Path) -> None:
    """Whatever a source is, its page has all of its text, balanced elements, and links that lead somewhere."""
    odd = ("(", ")", '"""', "f'{x", "'", "\\\n", "\n", "\r\n", "\t", "é", "<b>", "&", "def f", "#", "\x00", ";")
    pieces = [*SHOP.split(" "), *odd]
    random = Random(3)
    sources = []
    for number in range(200):
        text = " ".join(SHOP.split(" ")[: random.randrange(60)])
        text += "".join(random.choice(pieces) + random.choice(" \n") for _ in range(random.randrange(40)))
        (tmp_path / f"{number}.py").write_bytes(text.encode())
        sources.append(Source(str(tmp_path / f"{number}.py"), f"{number}.py"))
    assert write_site(sources, str(tmp_path / "site"), Settings(), reports_that_stop(1000)) == 0
    lines_seen = links_seen = 0
    for number in range(200):
        path = tmp_path / "site" / "files" / f"{number}.html"
        page = path.read_text()
        shown = [
            unescape(re.sub(r"<[^>]*>", "", line))
            for line in re.findall(r'<p id="L\d+"[^>]*><a[^>]*>\d+</a>(.*?)</p>', page)
        ]
        text = (tmp_path / f"{number}.py").read_bytes().decode().replace("\x00", "\u2400")
        lines = re.split("\r\n|\n|\r", text)
        assert shown == (lines if lines[-1] else lines[:-1])
        lines_seen += len(shown)
        opened = Html(path)
        for tag in ("a", "b", "p", "div", "main", "nav", "ul", "li"):
            assert page.count(f"</{tag}>") == sum(name == tag for name, _ in opened.tags), (number, tag)
        for _, attributes in opened.tags:
            file, _, anchor = (attributes.get("href") or "").partition("#")
            if anchor:
                target = tmp_path / "site" / "files" / file if file else path
                assert f'<p id="{anchor}"' in target.read_text(), (number, attributes)
                links_seen += 1
    assert lines_seen > 2000
    assert links_seen > 5000


@pytest.mark.parametrize("survey", [b"\xff", b"\x05\x01a", b"\x01\x01a\x04\x07\x00\x00\x00\x00", b"\xff" * 12])
def test_bytes_that_are_no_survey_are_told(survey: bytes) -> None:
    with pytest.raises(ValueError, match="no survey"):
        _host.SiteIndex(["a.py"], []).Add(0, survey)
    with pytest.raises(ValueError, match="no survey"):
        _host.SiteIndex(["a.py"], []).PlacesScript(survey)


# ---- in a browser ----


@pytest.fixture(scope="module")
def browser(tmp_path_factory: pytest.TempPathFactory) -> Iterator[Browser]:
    started = Browser(tmp_path_factory.mktemp("profile"))
    yield started
    started.close()


@pytest.fixture(scope="module")
def long_site(tmp_path_factory: pytest.TempPathFactory) -> Path:
    """A file of many lines, and names that look alike."""
    folder = tmp_path_factory.mktemp("long")
    lines = "".join(f"    def method{n}(self):\n        return self.query_set.run({n})\n\n" for n in range(1500))
    looks = "from sets import QuerySet\nself.QuerySet = QuerySet\nqueryset = QuerySet()\nclass MyQuerySet: pass\n"
    return make_report(folder, aaa=looks, sets=f"class QuerySet:\n{lines}", zzz="import sets as QuerySet\nrun = 1\n")


def active(page: Page) -> str:
    return page.value("document.querySelector('#found [aria-selected]').textContent")


def test_a_slash_goes_to_the_search_and_nothing_scrolls(browser: Browser, long_site: Path) -> None:
    page = browser.open(long_site / "files" / "1.html", "#L3000")
    page.wait("scrollY > 10000")
    before = page.value("scrollY")
    page.press("/")
    assert page.value("document.activeElement.id") == "search"
    assert page.value("search.value") == ""
    assert page.value("scrollY") == before
    page.type_text("query")
    page.wait("!document.getElementById('found').hidden")
    assert page.value("search.value") == "query"
    for _ in range(3):
        page.press("ArrowDown")
    assert page.value("scrollY") == before
    page.press("Escape")
    assert page.value("document.getElementById('found').hidden")
    page.press("Escape")
    assert page.value("document.activeElement === document.body")
    assert page.value("scrollY") == before


def test_the_search_ranks_a_class_first(browser: Browser, long_site: Path) -> None:
    page = browser.open(long_site / "index.html")
    page.press("/")
    page.type_text("QuerySet")
    page.wait("document.querySelectorAll('#found [role=option]').length > 2")
    assert active(page) == "classQuerySetsets.py:1"
    shown = page.value("[...document.querySelectorAll('#found [role=option]')].map(e => e.textContent)")
    assert "classMyQuerySetaaa.py:4" in shown
    assert not any(text.startswith("import") for text in shown)
    assert page.value("search.getAttribute('aria-activedescendant')") == "found0"
    page.press("ArrowUp")
    assert page.value("document.querySelector('#found [aria-selected]').id") == f"found{len(shown) - 1}"
    page.press("ArrowDown")
    page.press("Enter")
    page.wait("location.href.endsWith('/files/1.html#L1')")


def test_the_search_takes_a_scope_and_a_file(browser: Browser, long_site: Path) -> None:
    page = browser.open(long_site / "files" / "0.html")
    page.press("/")
    page.type_text("queryset.method7")
    page.wait("document.querySelector('#found [aria-selected]')")
    assert active(page) == "defmethod7 QuerySetsets.py:23"
    page.value("search.select()")
    page.type_text("zzz")
    page.wait("document.querySelector('#found [aria-selected]')?.textContent.includes('zzz')")
    assert active(page) == "filezzz.pyzzz.py"
    page.value("search.select()")
    page.type_text("nothing like it")
    page.wait("document.getElementById('found').textContent === 'Nothing is called that.'")


def test_a_click_lists_definitions_and_uses(browser: Browser, tmp_path: Path) -> None:
    site = make_report(tmp_path, a="import b\nb.work(1)\nwork = b.work\n", b="x = 1\n\ndef work(n): return n\n")
    page = browser.open(site / "files" / "0.html")
    page.click("document.querySelector('#L2 a.c')")
    page.wait("document.querySelectorAll('#panel .places a').length > 2")
    titles = page.value("[...document.querySelectorAll('#panel h3')].map(e => e.textContent)")
    assert titles == ["Definitions2", "Calls1", "Reads1"]
    page.wait("document.querySelector('#panel').textContent.includes('def work(n): return n')")
    hrefs = page.value("[...document.querySelectorAll('#panel .places a')].map(e => e.getAttribute('href'))")
    assert hrefs == ["#L3", "../files/1.html#L3", "#L2", "#L3"]
    page.press("Escape")
    assert page.value("document.getElementById('panel').hidden")


def test_a_local_name_is_listed_by_its_scope(browser: Browser, tmp_path: Path) -> None:
    site = make_report(tmp_path, a="def f(n):\n    return n\n\ndef g(n):\n    return n + n\n")
    page = browser.open(site / "files" / "0.html")
    page.click("document.querySelector('#L5 a.r')")
    page.wait("document.getElementById('panel')")
    assert page.value("document.querySelectorAll('#panel .places mark').length") == 5
    assert page.value("[...document.querySelectorAll('#panel .places i')].map(e => e.textContent)") == ["4", "5", "5"]
    assert page.value("document.querySelectorAll('main .on').length") == 3


def test_a_definition_is_listed_with_its_scope(browser: Browser, tmp_path: Path) -> None:
    site = make_report(
        tmp_path, a="x.run()\n", b="class A:\n    def run(self): pass\nclass B:\n    def run(self): pass\n"
    )
    page = browser.open(site / "files" / "0.html")
    page.click("document.querySelector('#L1 a.c')")
    page.wait("document.getElementById('panel')")
    assert page.value("[...document.querySelectorAll('#panel .places small')].map(e => e.textContent)") == ["A", "B"]


def test_a_keyword_lists_parameters_alone(browser: Browser, tmp_path: Path) -> None:
    site = make_report(tmp_path, a="f(using=1)\nx.using\n", b="def f(using): return using\n")
    page = browser.open(site / "files" / "0.html")
    page.click("document.querySelector('#L1 a.k')")
    page.wait("document.getElementById('panel')")
    titles = page.value("[...document.querySelectorAll('#panel h3')].map(e => e.textContent)")
    assert titles == ["Parameters1", "Keyword arguments1"]


def test_names_are_reached_by_keys(browser: Browser, tmp_path: Path) -> None:
    site = make_report(tmp_path, a="def f(n):\n    return n\n")
    page = browser.open(site / "files" / "0.html")
    page.value("document.querySelector('#L2 a.r').focus()")
    page.press("Enter")
    page.wait("document.activeElement.id === 'panel'")
    page.press("Tab")
    assert page.value("document.activeElement.getAttribute('aria-label')") == "Close"
    page.press("Escape")
    assert page.value("document.activeElement.textContent") == "n"


def test_the_address_of_a_name_opens_its_places(browser: Browser, tmp_path: Path) -> None:
    site = make_report(tmp_path, a="import b\nb.work(1)\n", b="x = 1\n\ndef work(n): return n\n")
    number = Html(site / "files" / "1.html").links("work")[0]["data-n"]
    page = browser.open(site / "files" / "1.html", f"#n{number}")
    page.wait("document.querySelector('#panel h2')?.textContent === 'work'")


def test_what_is_known_of_a_name_shows_under_the_pointer(browser: Browser, tmp_path: Path) -> None:
    page = browser.open(make_report(tmp_path, shop=SHOP) / "files" / "0.html")
    page.value("document.querySelectorAll('#L17 a.r')[2].focus()")
    assert page.value("document.getElementById('tip').textContent") == ": Item"
    page.value("document.querySelector('#L26 a.c.c[data-s]').focus()")
    assert page.value("document.getElementById('tip').textContent") == "class Item:"


def test_a_browser_runs_nothing_of_the_source(browser: Browser, tmp_path: Path) -> None:
    (tmp_path / f"{ATTACK.replace('/', '')}.py").write_text(f"x = 1\ny = {ATTACK!r}\n")
    site = make_report(tmp_path)
    page = browser.open(site / "files" / "0.html")
    page.click("document.querySelector('#L1 a.d')")
    page.wait("document.querySelector('#panel h2')?.textContent === 'x'")
    assert "broken" not in page.value("document.title").replace(ATTACK.replace("/", ""), "")
    assert page.value("document.scripts.length") == 1


@pytest.mark.parametrize("dark", [False, True])
def test_both_themes_can_be_read(browser: Browser, tmp_path: Path, dark: bool) -> None:
    site = make_report(tmp_path, a="# comment\nclass A:\n    x = 'text'  # more\n    y = 1\nz = = 1\n")
    page = browser.open(site / "files" / "0.html", dark=dark)
    ratios = page.value(CONTRASTS)
    assert len(ratios) > 8
    assert {what: ratio for what, ratio in ratios.items() if ratio < 4.5} == {}


# The contrast of each kind of text with what stands behind it, as accessibility guidelines work it out.
CONTRASTS = """(() => {
  const numbers = (colour) => colour.match(/[\\d.]+/g).map(Number);
  const light = (colour) => {
    const linear = (c) => (c /= 255) <= 0.03928 ? c / 12.92 : ((c + 0.055) / 1.055) ** 2.4;
    const [r, g, b] = numbers(colour).slice(0, 3).map(linear);
    return 0.2126 * r + 0.7152 * g + 0.0722 * b;
  };
  const behind = (e) => {
    const colour = getComputedStyle(e).backgroundColor;
    return (numbers(colour)[3] ?? 1) === 0 && e.parentElement ? behind(e.parentElement) : colour;
  };
  const found = {};
  const walker = document.createTreeWalker(document.body, NodeFilter.SHOW_TEXT);
  while (walker.nextNode()) {
    const e = walker.currentNode.parentElement;
    if (!walker.currentNode.data.trim() || getComputedStyle(e).visibility === "hidden") continue;
    if (e.matches("p > a:first-child, i, script")) continue;
    const [one, two] = [light(getComputedStyle(e).color), light(behind(e))].sort((a, b) => b - a);
    found[`${e.tagName} ${e.className} ${e.parentElement.className}`] = (one + 0.05) / (two + 0.05);
  }
  return found;
})()"""


def test_a_narrow_screen_is_not_wider_than_it_is(browser: Browser, tmp_path: Path) -> None:
    site = make_report(tmp_path, a="x = '" + "long " * 100 + "'\n")
    for path in (site / "index.html", site / "files" / "0.html"):
        page = browser.open(path, width=360, height=640)
        assert page.value("document.documentElement.scrollWidth") <= 360
