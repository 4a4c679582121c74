"""The sources: format, linters, the arrows between their layers."""
import re

import pytest
from conftest import BUILD, ROOT, run, tracked

CXX = tracked("*.cpp", "*.h", "*.c")
LIBRARY_UNITS = [path for path in CXX if path.suffix == ".cpp" and path.relative_to(ROOT).parts[0] in ("src", "platform")]
INCLUDE = re.compile(r'^\s*#\s*include\s*[<"]([^>"]+)[>"]', re.MULTILINE)


def shell_scripts():
    for path in tracked():
        if path.is_file() and path.suffix not in (".cpp", ".h", ".c", ".py", ".md"):
            first = path.open("rb").readline()
            if first.startswith(b"#!") and (b"sh" in first.split(b"/")[-1]):
                yield path


def test_clang_format():
    run("clang-format", "--dry-run", "-Werror", *CXX)


def test_clang_tidy(tmp_path):
    commands = (BUILD / "compile_commands.json").read_text()
    (tmp_path / "compile_commands.json").write_text(commands.replace("-fno-gnu-unique ", ""))  # unknown to clang
    run("run-clang-tidy", "-quiet", "-p", tmp_path, "-j", "2", *(f"^{re.escape(str(path))}$" for path in LIBRARY_UNITS))


def test_cppcheck():
    run("cppcheck", "--quiet", "--error-exitcode=1", "--std=c++20", "--inline-suppr", "--language=c++",
        "--enable=warning,performance,portability", "--suppress=missingIncludeSystem", '-DKOVA_UNIT="unit"',
        "-I", ROOT / "src", "-I", ROOT / "include", "-I", ROOT / "platform" / "include", "-I", ROOT / "platform" / "src",
        *LIBRARY_UNITS)


def test_shellcheck():
    scripts = list(shell_scripts())
    assert len(scripts) >= 5
    run("shellcheck", "-x", *scripts)


def test_pyflakes():
    run("/usr/bin/python3", "-m", "pyflakes", *tracked("*.py"))


def allowed(layer, include, families):
    """Whether a layer may include a header: arrows point down only."""
    first = include.split("/")[0]
    if first in families or first == "core":
        # a private header: core's by all, a family's by itself
        return layer == first or (first == "core" and layer in families)
    if include.startswith("kovanetsdk/"):
        return layer != "core" or include in ("kovanetsdk/core.h",)
    return True


def test_includes_point_down():
    families = {path.name for path in (ROOT / "src").iterdir() if path.is_dir() and path.name != "core"}
    wrong = []
    for path in tracked("src/*.cpp", "src/*.h"):
        layer = path.relative_to(ROOT / "src").parts[0]
        wrong += [f"{path.relative_to(ROOT)}: {include}" for include in INCLUDE.findall(path.read_text())
                  if not allowed(layer, include, families)]
    assert not wrong


def test_platform_and_tool_keep_to_public_headers():
    wrong = []
    for folder, forbidden in (("platform", ("kovanetsdk/",)), ("tools", ("core/", "kovanetsdk/net_int.h"))):
        for path in tracked(f"{folder}/*.cpp", f"{folder}/*.h"):
            wrong += [f"{path.relative_to(ROOT)}: {include}" for include in INCLUDE.findall(path.read_text())
                      if include.startswith(forbidden)]
    assert not wrong


def test_kernel_requests_stand_in_one_place():
    users = [path.relative_to(ROOT).as_posix() for path in tracked("src/*.cpp", "src/*.h")
             if re.search(r"\b(ioctl|ifreq)\b", re.sub(r"//.*|/\*.*?\*/", "", path.read_text(), flags=re.DOTALL))]
    assert users == ["src/core/kernel.cpp"]


@pytest.mark.parametrize("path", LIBRARY_UNITS, ids=lambda path: path.stem)
def test_unit_has_no_goto_and_no_unfinished_mark(path):
    text = path.read_text()
    assert not re.search(r"\bgoto\b", text)
    assert not re.search(r"\b(TODO|FIXME|XXX|HACK)\b", text)


def test_every_unit_has_its_test():
    units = {path.stem for path in (ROOT / "src").glob("*/*.cpp") if not path.with_suffix(".h").exists()}  # helpers have one
    tests = {path.name.removesuffix("_test.cpp") for path in (ROOT / "tests" / "unit").glob("*_test.cpp")}
    assert units - tests == set()
