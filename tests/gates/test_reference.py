"""The reference for callers, as `doxygen docs/Doxyfile` makes it of the headers; what it warns of is an error."""
import html
import re

import pytest
from conftest import BUILD, ROOT, run

PAGES = BUILD / "reference" / "html"


@pytest.fixture(scope="module", autouse=True)
def reference():
    (BUILD / "reference").mkdir(parents=True, exist_ok=True)
    run("doxygen", "docs/Doxyfile", cwd=ROOT)


def text_of(page):
    return html.unescape(re.sub(r"<[^>]*>", " ", page.read_text()))


def test_every_export_is_described():
    exports = set(re.findall(r"^ {4}(\w+);$", (ROOT / "src" / "exports.map").read_text(), re.MULTILINE))
    described = {name for page in PAGES.glob("*_8h.html")
                 for name in re.findall(r'class="memtitle">.*</span>(\w+)', page.read_text())}
    assert len(exports) > 100 and exports - described == set()


def test_error_table_is_complete():
    header = (ROOT / "include" / "kovanetsdk" / "core.h").read_text()
    codes = dict(re.findall(r"#define (NET_ERR_\w+)\s+\\?\s*(0x\w+)", header))
    assert len(codes) == header.count("#define NET_ERR_") > 0
    table = text_of(PAGES / "group__errors.html")
    for name, code in codes.items():
        assert re.search(rf"#define\s+{name}\s+{code}\s+\w", table), name


def test_internal_header_is_left_out():
    assert not list(PAGES.glob("net__int*"))
