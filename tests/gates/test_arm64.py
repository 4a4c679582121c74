"""What is built for 64-bit Arm: that nothing is left out, the records of its headers, and its programs under emulation."""
import os
import re
import subprocess

import pytest
from conftest import BUILD, COMPILE_FLAGS, ROOT, STAGE, run

ARM64 = BUILD / "arm64"
EMULATOR = ["qemu-aarch64", "-L", "/usr/aarch64-linux-gnu"]
NOT_OF_THE_PROJECT = ("_deps/", "lib/")  # the tests' library, which is there already for this machine
LIBRARIES = {"libc.so.6", "ld-linux-aarch64.so.1", "libm.so.6"} | {
    f"lib{name}.so.6" for name in ("kovanetsdk", "kovacore", "kovasdk", "kovahacore", "kovadhmxcore")}
MORE_LIBRARIES = {"usr/bin/gogoc": {"libcrypt.so.1"}}


def emulated(*command):
    return run(*EMULATOR, *command)


def made_in(build):
    """Everything that a build compiles, links or generates: file -> how, in the words of the build."""
    made = {}
    for line in run("ninja", "--quiet", "-C", build, "-t", "targets", "all").splitlines():
        name, how = line.rsplit(": ", 1)
        if re.match("CX?X?_|CUSTOM_COMMAND", how) and not name.startswith(("/", *NOT_OF_THE_PROJECT)):
            made[name] = how
    return made


def processor(path):
    return re.search(r"Machine: +(.*)\n", run("aarch64-linux-gnu-readelf", "-h", path)).group(1)


@pytest.fixture(name="installed", scope="module")
def installed_tree(tmp_path_factory):
    tree = tmp_path_factory.mktemp("arm64")
    run("cmake", "--install", ARM64, env={**os.environ, "DESTDIR": str(tree)})
    return tree


def files_in(tree):
    return {str(path.relative_to(tree)): path for path in tree.rglob("*") if not path.is_dir()}


def programs_in(tree):
    """Everything in machine code."""
    return {name: path for name, path in files_in(tree).items()
            if path.is_file() and not path.is_symlink() and path.read_bytes()[:4] == b"\x7fELF"}


def test_everything_is_built():
    assert made_in(ARM64) == made_in(BUILD) != {}


def test_everything_built_is_for_the_processor():
    linked = [name for name, how in made_in(ARM64).items() if "_LINKER" in how]
    assert len(linked) > 15 and {processor(ARM64 / name) for name in linked} == {"AArch64"}


def test_everything_is_installed(installed):
    here = {name.replace("x86_64-linux-gnu", "aarch64-linux-gnu") for name in files_in(STAGE)}
    assert files_in(installed).keys() == here - {"usr/kova/sbin/dhclient"}  # Debian's own, of this machine's processor


def test_everything_installed_needs_what_an_appliance_has(installed):
    programs = programs_in(installed)
    assert len(programs) > 9
    for name, path in programs.items():
        assert processor(path) == "AArch64", name
        needed = set(re.findall(r"\(NEEDED\).*\[(.*)\]", run("aarch64-linux-gnu-readelf", "-dW", path)))
        assert "libc.so.6" in needed and needed <= LIBRARIES | MORE_LIBRARIES.get(name, set()), name


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


@pytest.mark.parametrize("program,words", [("appliance/gogoc", "usage: gogoc -f FILE"), ("lab/kova-box", "throw-away appliance"),
                                           ("bench/kova-bench", "--quick")])
def test_program_says_how_it_is_used(program, words):
    libraries = ":".join(str(ARM64 / folder) for folder in ("src", "platform", "../arm64-libraries/lib"))
    done = subprocess.run([*EMULATOR, "-E", f"LD_LIBRARY_PATH={libraries}", ARM64 / program, "--help"],
                          stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True, check=False)
    assert words in done.stdout, (done.returncode, done.stdout)
