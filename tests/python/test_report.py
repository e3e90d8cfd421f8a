"""The site of an index: its links lead somewhere, its texts stay texts, and a browser runs it from disk."""

from __future__ import annotations

import os
import re
import shutil
import subprocess
import tempfile
from html import unescape
from html.parser import HTMLParser
from pathlib import Path

import pytest

from indexing import ODD_NAMES, SHOP, make_index, run
from quillet.report.source_page import place_links, rows

ATTACK = "</code><script>document.title = 'broken'</script>"


class Page(HTMLParser):
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
        return [
            attributes
            for place, (tag, attributes) in enumerate(self.tags)
            if tag == "a" and self.texts.get(place) == text and "data-n" in attributes
        ]


def make_report(folder: Path, **files: str) -> Path:
    make_index(folder, **files)
    result = run("report", "-o", "site", cwd=folder)
    assert result.returncode == 0, result.stderr
    return folder / "site"


def browser() -> str:
    for name in ("chromium", "chromium-browser", "google-chrome", "chrome"):
        path = shutil.which(name)
        if path is not None:
            return path
    pytest.skip("no Chromium is installed")


def dom_of(page: Path, anchor: str = "") -> str:
    """The document of a page after its scripts ran, as a browser without a window has it."""
    with tempfile.TemporaryDirectory() as profile:
        result = subprocess.run(
            [
                browser(),
                "--headless",
                "--no-sandbox",
                "--disable-gpu",
                f"--user-data-dir={profile}",
                "--virtual-time-budget=4000",
                "--dump-dom",
                page.as_uri() + anchor,
            ],
            capture_output=True,
            timeout=120,
            check=True,
        )
    return result.stdout.decode()


def test_every_link_leads_somewhere(tmp_path: Path) -> None:
    site = make_report(tmp_path, shop=SHOP, other="from shop import Shop\nShop().add(1)\n", bad="x = = 1\n")
    pages = {path: Page(path) for path in site.rglob("*.html")}
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
    site = make_report(tmp_path, shop=SHOP)
    page = Page(site / "files" / "0.html")
    assert [link["href"] for link in page.links("Item")] == ["#L7", "#L7", "#L7"]
    assert [link["href"] for link in page.links("name")] == ["#L20", "#L20"]
    assert [link["href"] for link in page.links("item")] == ["#L15", "#L15"]
    assert page.links("self")[0]["href"] == "#L10"
    assert [link["href"] for link in page.links(".price")] == ["#L11"]


def test_a_name_of_another_file_leads_there(tmp_path: Path) -> None:
    site = make_report(tmp_path, a="import b\nb.work(1)\n", b="x = 1\n\ndef work(n): return n\n")
    assert [link["href"] for link in Page(site / "files" / "0.html").links(".work")] == ["1.html#L3"]


def test_hints_and_values_are_shown_on_hover(tmp_path: Path) -> None:
    site = make_report(tmp_path, shop=SHOP)
    page = Page(site / "files" / "0.html")
    assert {link["data-tip"] for link in page.links("item")} == {"item : Item"}
    assert page.links("LIMIT")[0]["data-tip"] == "LIMIT : int  = int: 10"


def test_errors_stand_below_their_line_and_on_the_front_page(tmp_path: Path) -> None:
    site = make_report(tmp_path, a="x = 1\ny = = 2\n")
    page = (site / "files" / "0.html").read_text()
    assert '<div id="L2" class="bad">' in page
    assert '<div class="error"><code>    ^ invalid syntax</code></div>' in page
    assert '<a href="files/0.html#L2">a.py:2:5</a> invalid syntax' in (site / "index.html").read_text()


def test_every_line_of_the_source_is_there(tmp_path: Path) -> None:
    source = (
        'x = """a\n\n  # no comment\n"""  # comment\nif x:\r\n\tpass\ny = \'é\' + f"{x}"\nz = """open\nto the end\\'
    )
    (tmp_path / "a.py").write_bytes(source.encode())
    site = make_report(tmp_path)
    page = (site / "files" / "0.html").read_text()
    lines = re.findall(r'<div id="L\d+"[^>]*><a[^>]*>\d+</a><code>(.*?)</code>', page)
    assert [unescape(re.sub(r"<[^>]*>", "", line)) for line in lines] == re.split("\r\n|\n", source)
    assert '<b class="s">  # no comment</b>' in page
    assert '<b class="c"># comment</b>' in page


def test_source_and_file_names_stay_text(tmp_path: Path) -> None:
    for name in [*ODD_NAMES, "<img src=x onerror=alert(1)>.py"]:
        (tmp_path / os.fsdecode(name)).write_text(f"x = {ATTACK!r}\ny: {ATTACK!r} = '\x00\x1b'\nz = = \"{ATTACK}\n")
    site = make_report(tmp_path)
    allowed = {"html", "head", "meta", "title", "link", "script", "body", "header", "a", "span", "label", "input"}
    allowed |= {"ol", "ul", "li", "p", "div", "nav", "h2", "i", "b", "main", "code", "aside", "section", "table"}
    allowed |= {"thead", "tbody", "tr", "th", "td", "strong"}
    for path in site.rglob("*.html"):
        page = Page(path)
        assert {tag for tag, _ in page.tags} <= allowed
        assert sum(tag == "script" for tag, _ in page.tags) == 1
        assert not any(key.startswith("on") for _, attributes in page.tags for key in attributes)
        assert not re.search(r"[\x00-\x08\x0b-\x1f\x7f]", path.read_text())
    assert sorted(path.name for path in (site / "files").iterdir()) == [f"{n}.html" for n in range(8)]


def test_nothing_is_written_outside_the_folder(tmp_path: Path) -> None:
    (tmp_path / "source").mkdir()
    make_index(tmp_path / "source", shop=SHOP)
    run("report", "-o", "../site", cwd=tmp_path / "source")
    before = {".quillet-index", ".quillet-index.lock", "shop.py"}
    assert {path.name for path in (tmp_path / "source").iterdir()} == before
    assert {path.name for path in tmp_path.iterdir()} == {"source", "site"}


def test_a_folder_that_holds_something_else_is_left_alone(tmp_path: Path) -> None:
    make_index(tmp_path, a="x = 1\n")
    (tmp_path / "mine").mkdir()
    (tmp_path / "mine" / "thesis.txt").write_text("text")
    result = run("report", "-o", "mine", cwd=tmp_path)
    assert result.returncode == 2
    assert "holds something else" in result.stderr
    assert [path.name for path in (tmp_path / "mine").iterdir()] == ["thesis.txt"]


def test_a_second_report_replaces_the_first(tmp_path: Path) -> None:
    site = make_report(tmp_path, a="x = 1\n", b="y = 1\n")
    (tmp_path / "b.py").unlink()
    make_report(tmp_path)
    assert [path.name for path in (site / "files").iterdir()] == ["0.html"]


def test_a_file_that_changed_since_is_marked(tmp_path: Path) -> None:
    make_index(tmp_path, a="first = 1\n")
    (tmp_path / "a.py").write_text("x = 1\nfirst = 1\n")
    assert "changed since" in run("report", "-o", "site", cwd=tmp_path).stderr
    page = Page(tmp_path / "site" / "files" / "0.html")
    assert page.links("first") == []
    (tmp_path / "a.py").unlink()
    run("report", "-o", "site", cwd=tmp_path)
    assert "gone since" in (tmp_path / "site" / "files" / "0.html").read_text()


def test_the_site_loads_nothing_from_elsewhere(tmp_path: Path) -> None:
    site = make_report(tmp_path, shop=SHOP)
    for path in site.rglob("*.*"):
        assert not re.search(r"https?:|@import|url\(", path.read_text()), path


def test_longer_names_continue_behind_shorter_ones() -> None:
    links = place_links(b"a.b.c = b", [(1, "a.b.c", "3"), (1, "a", "1"), (1, "a.b", "2"), (9, "b", "4"), (2, "x", "5")])
    assert [tuple(link) for link in links] == [(0, 1, "1"), (1, 3, "2"), (3, 5, "3"), (8, 9, "4")]


def test_a_long_source_without_ends_of_strings_is_coloured_in_time() -> None:
    lines = [b"'''\"" * 20000, b'f"""' + b"\\" * 50001, b"x" * 100000]
    assert len("".join(rows(lines, lambda number: [], {}))) > 200000


# ---- in a browser ----


def test_a_browser_shows_the_places_of_a_name(tmp_path: Path) -> None:
    site = make_report(tmp_path, a="import b\nb.work(1)\n", b="x = 1\n\ndef work(n): return n\n")
    number = Page(site / "files" / "1.html").links("work")[0]["data-n"]
    panel = dom_of(site / "files" / "1.html", f"#n{number}").split('<aside id="panel">')[1]
    assert "<h2>work</h2>" in panel
    assert '<a href="../files/1.html#L3">b.py:3:5</a>' in panel


def test_a_browser_runs_nothing_of_the_source(tmp_path: Path) -> None:
    (tmp_path / f"{ATTACK.replace('/', '')}.py").write_text(f"x = 1\ny = {ATTACK!r}\n")
    site = make_report(tmp_path)
    number = Page(site / "files" / "0.html").links("x")[0]["data-n"]
    dom = dom_of(site / "files" / "0.html", f"#n{number}")
    assert "<h2>x</h2>" in dom
    assert "<title>broken" not in dom
    assert "<title>broken" not in dom_of(site / "index.html")
