"""The installed tree, as a program outside the sources sees it, and the example of the README as printed."""
import os
import re

import pytest
from conftest import ROOT, STAGE, run

OUTSIDE = """#include <kovanetsdk/kovanetsdk.h>
int main(void) { return BlKLIBIsIpAddr("192.168.1.10") == 1 && KLIBCErrGet() == 0 ? 0 : 1; }
"""


@pytest.fixture
def source(tmp_path):
    path = tmp_path / "outside.c"
    path.write_text(OUTSIDE)
    return path


def library_folder():
    [pkgconfig] = STAGE.glob("usr/lib/*/pkgconfig")
    return pkgconfig.parent


def runs(program):
    run(program, env={**os.environ, "LD_LIBRARY_PATH": str(library_folder())})


def pkg_config(*words):
    environment = {**os.environ, "PKG_CONFIG_SYSROOT_DIR": str(STAGE),
                   "PKG_CONFIG_LIBDIR": str(library_folder() / "pkgconfig"), "PKG_CONFIG_ALLOW_SYSTEM_CFLAGS": "1",
                   "PKG_CONFIG_ALLOW_SYSTEM_LIBS": "1"}
    return run("pkg-config", *words, "kovanetsdk", env=environment).split()


def build_with_pkg_config(source, program):
    run("gcc", "-std=c99", "-pedantic", "-Wall", "-Wextra", "-Werror", source, "-o", program,
        *pkg_config("--cflags", "--libs"), "-Wl,-rpath-link," + str(library_folder()))


def test_pkg_config(source, tmp_path):
    build_with_pkg_config(source, tmp_path / "outside")
    runs(tmp_path / "outside")


def test_cmake_package(source, tmp_path):
    (tmp_path / "CMakeLists.txt").write_text(
        "cmake_minimum_required(VERSION 3.25)\nproject(outside C)\nfind_package(kovanetsdk 6 REQUIRED)\n"
        "add_executable(outside outside.c)\ntarget_link_libraries(outside kovanetsdk::kovanetsdk)\n")
    run("cmake", "-S", tmp_path, "-B", tmp_path / "build", f"-DCMAKE_PREFIX_PATH={STAGE}/usr")
    run("cmake", "--build", tmp_path / "build")
    runs(tmp_path / "build" / "outside")


def test_internal_header_is_not_installed():
    installed = {path.name for path in (STAGE / "usr" / "include" / "kovanetsdk").iterdir()}
    assert "kovanetsdk.h" in installed and "net_int.h" not in installed


def test_readme_example_compiles_as_printed(tmp_path):
    [example] = re.findall(r"```c\n(.*?)```", (ROOT / "README.md").read_text(), re.DOTALL)
    (tmp_path / "example.c").write_text(example)
    build_with_pkg_config(tmp_path / "example.c", tmp_path / "example")


@pytest.mark.parametrize("page", ["README.md", *(str(path.relative_to(ROOT)) for path in ROOT.glob("docs/*.md"))])
def test_pages_name_what_is_there(page):
    for target in re.findall(r"\]\(([^)#]+)\)", (ROOT / page).read_text()):
        assert (ROOT / page).parent.joinpath(target).exists(), f"{page} links to {target}"
