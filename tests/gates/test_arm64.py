"""What is built for 64-bit Arm: that it is that, the records of its headers, and its programs under emulation."""
import re

import pytest
from conftest import BUILD, COMPILE_FLAGS, ROOT, run

ARM64 = BUILD / "arm64"
SYSTEM = "/usr/aarch64-linux-gnu"
OBJECTS = [*(f"platform/lib{name}.so.6.0.0" for name in ("kovacore", "kovasdk", "kovahacore", "kovadhmxcore")),
           "src/libkovanetsdk.so.6.0.0", "tools/kovanet/kovanet", "appliance/radnsd", "appliance/kovarelayd", "appliance/pppoe-options"]
LIBRARIES = {"libc.so.6", "ld-linux-aarch64.so.1", "libm.so.6"} | {
    f"lib{name}.so.6" for name in ("kovanetsdk", "kovacore", "kovasdk", "kovahacore", "kovadhmxcore")}


def emulated(*command):
    return run("qemu-aarch64", "-L", SYSTEM, *command)


@pytest.mark.parametrize("name", OBJECTS)
def test_object_is_for_the_processor_and_needs_what_an_appliance_has(name):
    assert re.search(r"Machine: +AArch64\n", run("aarch64-linux-gnu-readelf", "-h", ARM64 / name))
    needed = set(re.findall(r"\(NEEDED\).*\[(.*)\]", run("aarch64-linux-gnu-readelf", "-dW", ARM64 / name)))
    assert "libc.so.6" in needed and needed <= LIBRARIES


@pytest.mark.parametrize("language", [["gcc", "-std=c11"], ["g++", "-std=c++20", "-D_Static_assert=static_assert", "-xc++"]],
                         ids=["c", "c++"])
def test_record_layouts(language, tmp_path):
    compiler, *options = language
    run(f"aarch64-linux-gnu-{compiler}", *options, "-Wall", "-Werror", *COMPILE_FLAGS, "-c",
        ROOT / "tests" / "gates" / "layout.c", "-o", tmp_path / "layout.o")


def test_exports_are_the_same():
    def exported(folder, *tools):
        symbols = run(*tools, "-D", "--defined-only", folder / "src" / "libkovanetsdk.so.6.0.0").splitlines()
        return {line.split()[2] for line in symbols}

    assert exported(ARM64, "aarch64-linux-gnu-nm") == exported(BUILD, "nm") != set()


def test_tool_answers():
    answer = emulated(ARM64 / "tools" / "kovanet" / "kovanet", "check", "prefix", "192.168.1.77/24", "--json")
    assert answer == run(BUILD / "tools" / "kovanet" / "kovanet", "check", "prefix", "192.168.1.77/24", "--json")
    assert "192.168.1.0" in answer
