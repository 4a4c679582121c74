"""The shared objects: what they need, what they export, and that programs of both languages link them."""
import os
import re
import shutil
import subprocess

import pytest
from conftest import BUILD, COMPILE_FLAGS, ROOT, STAGE, run

PLATFORM = {"libkovacore.so.6", "libkovasdk.so.6", "libkovahacore.so.6", "libkovadhmxcore.so.6"}
C_LIBRARY = {"libc.so.6", "ld-linux-x86-64.so.2", "ld-linux-aarch64.so.1"}
OBJECTS = ["kovanetsdk", "kovacore", "kovasdk", "kovahacore", "kovadhmxcore"]
HEADERS = sorted(path for path in (ROOT / "include" / "kovanetsdk").glob("*.h") if path.name != "net_int.h")
PLATFORM_HEADERS = sorted((ROOT / "platform" / "include" / "kova").glob("*.h"))
DECLARATION = re.compile(r"^(?:[A-Za-z_][\w ]*[ *])(\w+)[(\[]", re.MULTILINE)  # functions and tables


def shared_object(name):
    [found] = STAGE.glob(f"usr/lib/*/lib{name}.so.6.*")
    return found


def without_comments(text):
    return re.sub(r"/\*.*?\*/", "", text, flags=re.DOTALL)


def declared(headers):
    return {name for path in headers for name in DECLARATION.findall(without_comments(path.read_text()))}


def exported(name):
    symbols = run("nm", "-D", "--defined-only", shared_object(name)).splitlines()
    return {line.split()[2].split("@")[0] for line in symbols if line.split()[1] != "A"}


def dynamic(name, tag):
    return set(re.findall(rf"\({tag}\).*\[(.*)\]", run("readelf", "-dW", shared_object(name))))


@pytest.mark.parametrize("name", OBJECTS)
def test_soname_is_the_documented_one(name):
    assert dynamic(name, "SONAME") == {f"lib{name}.so.6"}


@pytest.mark.parametrize("name", OBJECTS)
def test_needs_nothing_beyond_the_c_library_and_the_platform(name):
    needed = dynamic(name, "NEEDED")
    assert "libc.so.6" in needed
    assert needed <= C_LIBRARY | (PLATFORM if name == "kovanetsdk" else {"libkovacore.so.6"})
    assert not dynamic(name, "RUNPATH") and not dynamic(name, "RPATH")


def test_exports_are_the_version_script_and_the_headers():
    script = set(re.findall(r"^ {4}(\w+);$", (ROOT / "src" / "exports.map").read_text(), re.MULTILINE))
    assert exported("kovanetsdk") == script
    assert declared(HEADERS) == script


def test_platform_exports_are_its_headers():
    there = set().union(*(exported(name) for name in OBJECTS[1:]))
    assert there == declared(PLATFORM_HEADERS)


@pytest.mark.parametrize("name", OBJECTS)
def test_has_no_static_constructors(name):
    sections = run("readelf", "-SW", shared_object(name))
    sizes = re.findall(r"\.init_array\s+INIT_ARRAY\s+\w+ \w+ (\w+)", sections)
    assert [int(size, 16) for size in sizes] in ([], [8]), "more than the C run-time's own entry"
    symbols = subprocess.run(["nm", shared_object(name)], capture_output=True, text=True, check=True).stdout
    assert "_GLOBAL__sub_I" not in symbols


@pytest.mark.parametrize("header", HEADERS + PLATFORM_HEADERS, ids=lambda path: path.name)
@pytest.mark.parametrize("compiler", [["gcc", "-std=c99", "-xc"], ["g++", "-std=c++11", "-xc++"]], ids=["c99", "c++"])
def test_header_compiles_alone(header, compiler, tmp_path):
    source = tmp_path / "alone"
    source.write_text(f'#include "{header}"\nint more_than_nothing;\n')  # C wants something declared
    run(*compiler, "-pedantic-errors", "-Wall", "-Wextra", "-Werror", "-fsyntax-only", *COMPILE_FLAGS, source)


@pytest.mark.parametrize("header", HEADERS + PLATFORM_HEADERS, ids=lambda path: path.name)
def test_every_function_is_documented(header):
    text = header.read_text()
    bare = [match.group(1) for match in re.finditer(r"(?<=;\n)\n?[A-Za-z_][\w ]*[ *](\w+)\([^;{]*\);", text)]
    first = [match.group(1) for match in re.finditer(r"(?<=\n)\n[A-Za-z_][\w ]*[ *](\w+)\([^;{]*\);", text)]
    assert not bare and not first, "declared without a comment right before"


@pytest.mark.parametrize("optimisation", ["-O0", "-O2"])
def test_c_program_links_every_export(tmp_path, optimisation):
    names = sorted(exported("kovanetsdk"))
    source = tmp_path / "all.c"
    source.write_text("#include <kovanetsdk/kovanetsdk.h>\n#include <stdio.h>\nint main(void)\n{\n    void *all[] = {"
                      + ", ".join(f"(void *)&{name}" for name in names) + "};\n"
                      "    for (unsigned i = 0; i < sizeof all / sizeof *all; i++)\n        if (!all[i]) return 1;\n"
                      f"    return sizeof all / sizeof *all == {len(names)} ? 0 : 1;\n}}\n")
    folder = shared_object("kovanetsdk").parent
    run("gcc", "-std=c99", optimisation, *COMPILE_FLAGS, source, "-o", tmp_path / "all", "-L", folder,
        "-l:libkovanetsdk.so.6", "-Wl,-rpath-link," + str(folder))
    run(tmp_path / "all", env={**os.environ, "LD_LIBRARY_PATH": str(folder)})


def test_library_builds_without_optimisation():
    """Inlining must not be what keeps the C++ run-time library out of the link."""
    plain = BUILD / "plain"
    launcher = f"-DCMAKE_CXX_COMPILER_LAUNCHER={shutil.which('ccache') or ''}"
    run("cmake", "-S", ROOT, "-B", plain, "-G", "Ninja", "-DCMAKE_BUILD_TYPE=Debug", "-DKOVA_TESTS=OFF", launcher)
    run("cmake", "--build", plain, "--target", "kovanetsdk")


def test_record_layouts(tmp_path):
    run("gcc", "-std=c11", "-Wall", "-Werror", *COMPILE_FLAGS, "-c", ROOT / "tests" / "gates" / "layout.c", "-o",
        tmp_path / "layout.o")
