#!/usr/bin/env python3
"""Runs the rings of the proof and adds up their results.

usage: ./test [--list] [--refresh] [--backend box|guest] [NAME...]

A NAME is a ring (unit, platform, property, fault, crash, sanitize, valgrind, coverage, arm64, lab, guest, gates), a test file
(test_jobs, test_abi), a source unit (net_set_ip), or dhcp-fuzz, which tries 10000 random DHCP subnets with another seed
each time; without a name everything runs. KOVA_SEED and KOVA_ROUNDS say what the random tests try. The last line counts
the test cases.

A lab test names in a line "# needs:" what its kernel has to have. It runs in the box where this machine's kernel has that,
otherwise in the guest (ring guest); where boxes are refused everything runs in the guest.
"""
import argparse
import concurrent.futures
import os
import pathlib
import platform
import random
import shutil
import signal
import subprocess
import sys
import tempfile
import time
import xml.etree.ElementTree as xml

from backends import BOX, KERNEL_PARTS, in_backend, refusal, shortcoming

ROOT = pathlib.Path(__file__).resolve().parent.parent
BUILD = ROOT / "build"
PYTHON = "/usr/bin/python3"
UNIT_PROGRAMS = {"unit": "tests/kovanet-unit-tests", "platform": "tests/platform/kova-platform-tests"}
PROGRAMS = {**UNIT_PROGRAMS, "fault": "tests/kovanet-fault-tests", "crash": "tests/crash/kova-crash-tests"}
BUILT_ANEW = {"sanitize", "coverage", "arm64"}  # rings that need the libraries once more, in a way of their own
FAULT_SHARDS = 2  # processes that share the sweep: it mostly waits for its own processes
SLOWEST = 5400  # seconds for one step, on a machine that has much else to do


MAKE_BOXES = {"test_bench", "test_debian"}  # gates that do
OF_THE_LAB_ITSELF = {"test_box": ("lab", "box"), "test_guest": ("guest", "guest")}  # file -> ring, what it makes itself
NOT_IN_GUEST = {"sanitize": "sanitizers do not run on its kernel", "valgrind": "valgrind does not run on its kernel"}


class Step:
    """
    One test program in one backend (or on the host), whose results come as a JUnit file. Lines of its output that begin
    with the text "shown" are measurements, to be seen also when all is well. One that is "last" judges what the others
    have left.
    """

    def __init__(self, ring, name, command, report, environment=None, options=None, needs=frozenset(), makes=None,
                 shown=None, last=False, note="", refusal=""):
        self.ring, self.name, self.command, self.report = ring, name, command, report
        self.environment = {**os.environ, **(environment or {})}
        self.options, self.needs = options, needs  # of the box; None on the host
        self.makes = makes  # the backend that the tests start themselves
        self.shown, self.last, self.note = shown, last, note
        self.refusal = refusal  # why it cannot run on this machine, whatever the backend
        self.backend, self.reasons, self.seconds = None, [], 0.0
        self.passed = self.failed = self.skipped = 0

    def place(self, backends):
        """Chooses the first backend that has what the step needs."""
        if self.refusal:
            self.skip(self.refusal)
        elif self.options is None:
            if self.makes and refusal(self.makes):
                self.skip(f"{self.makes}: {refusal(self.makes)}")
        else:
            self.choose(backends)

    def choose(self, backends):
        refused = []
        for backend in backends:
            reason = NOT_IN_GUEST.get(self.ring) if backend == "guest" else None
            reason = reason or shortcoming(backend, self.needs)
            if not reason:
                self.backend = backend
                self.command = in_backend(backend, [*self.options, "--limit", str(SLOWEST)], self.command)
                return
            refused.append(f"{backend}: {reason}")
        self.skip("; ".join(refused))

    def skip(self, reason):
        self.skipped, self.reasons = 1, [f"{self.name}: {reason}"]

    def run(self):
        if self.skipped:
            return self
        begin = time.monotonic()
        try:
            # the tests end processes by signals, which are ignored by those that nohup or a shell in the background starts
            done = subprocess.run(["env", "--default-signal", *self.command], cwd=ROOT, env=self.environment,
                                  stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True,
                                  errors="replace", timeout=SLOWEST + 60)  # a box ends by itself before
            self.output, self.status = done.stdout, done.returncode
        except subprocess.TimeoutExpired as late:
            self.output = (late.stdout or b"").decode(errors="replace") + f"\nstill running after {SLOWEST} s\n"
            self.status = 124
        self.seconds = time.monotonic() - begin
        self.count()
        return self

    def count(self):
        try:
            suites = xml.parse(self.report).getroot()
        except (OSError, xml.ParseError):
            self.failed = 1  # died before it could report
            return
        for case in suites.iter("testcase"):
            skip = case.find("skipped")
            if skip is not None or case.get("result") == "skipped":
                self.skipped += 1
                reason = skip.get("message") if skip is not None else ""
                self.reasons.append(f"{case.get('classname')}.{case.get('name')}: {reason}")
            elif case.find("failure") is not None or case.find("error") is not None:
                self.failed += 1
            elif case.get("status") != "notrun":
                self.passed += 1
        if self.status != 0 and self.failed == 0:
            self.failed = 1  # a leak report, a crash after the last test
        if self.passed + self.failed + self.skipped == 0:
            self.failed = 1  # a step without a test proves nothing


def gtest_step(out, ring, kind, build, unit=None, part=None, wrapper=(), only=(), without=(), **more):
    program = build / PROGRAMS[kind]
    report = out / f"{ring}-{kind}-{unit or part or 'all'}.xml"
    chosen = ":".join(f"{suite}.*" for suite in [unit, *only] if suite) or "*"
    command = [*wrapper, str(program), f"--gtest_output=xml:{report}", "--gtest_brief=1",
               f"--gtest_filter={chosen}{'-' + ':'.join(without) if without else ''}"]
    named = "/".join([kind, *filter(None, [unit, part])])
    return Step(ring, named, command, report, options=["--share", str(out)], **more)


def fault_steps(out):
    """The sweep, in parts that run side by side."""
    for number in range(FAULT_SHARDS):
        yield gtest_step(out, "fault", "fault", BUILD, part=f"{number + 1}of{FAULT_SHARDS}", shown="fault points of ",
                          environment={"GTEST_TOTAL_SHARDS": str(FAULT_SHARDS), "GTEST_SHARD_INDEX": str(number)})


def property_step(out, name, seed, rounds, chosen="*"):
    report = out / f"{name}.xml"
    command = [str(BUILD / "tests/property/kovanet-property-tests"), f"--gtest_output=xml:{report}", "--gtest_brief=1",
               f"--gtest_filter={chosen}"]
    settings = {"KOVA_SEED": os.environ.get("KOVA_SEED", str(seed)),
                "KOVA_ROUNDS": os.environ.get("KOVA_ROUNDS", str(rounds))}
    note = " ".join(f"{name}={value}" for name, value in settings.items())
    return Step("property", name, command, report, settings, options=["--share", str(out)], note=note)


def record_fault_points():
    """What ./test fault --refresh does."""
    command = [str(BOX), "--", str(BUILD / PROGRAMS["fault"]), "--points"]
    lines = subprocess.run(command, cwd=ROOT, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, text=True, check=True)
    (ROOT / "tests" / "fault" / "points.txt").write_text(lines.stdout)


def units_of(kind):
    folder = ROOT / "tests" / kind
    return sorted(path.name.removesuffix("_test.cpp") for path in folder.glob("*_test.cpp"))


def header(path, key):
    """The words of a test file's line "# KEY: ...", among the comments it begins with."""
    for line in path.read_text().splitlines():
        if not line.startswith("#"):
            break
        if line.startswith(f"# {key}:"):
            return line.partition(":")[2].split()
    return []


def needs_of(path):
    needs = frozenset(header(path, "needs"))
    if unknown := needs - KERNEL_PARTS.keys():
        sys.exit(f"{path}: no part of a kernel that is known here: {' '.join(sorted(unknown))}")
    return needs


def pytest_step(out, ring, path, in_appliance=False, makes=None, options=(), environment=None, **more):
    """A file of tests, on the host, or in an appliance that has what its "# box:" and "# needs:" lines ask for."""
    report = out / f"{path.stem}.xml"
    command = [PYTHON, "-B", "-m", "pytest", "-q", "-p", "no:cacheprovider", *options, f"--junitxml={report}", str(path)]
    environment = {"KOVA_BUILD": str(BUILD), "KOVA_BOX_PROGRAM": str(BOX), **(environment or {})}
    if not in_appliance:
        return Step(ring, path.stem, command, report, environment, makes=makes, **more)
    place = ["--share", str(out), "--tree", str(BUILD / "stage"), *header(path, "box")]
    needs = needs_of(path)
    if needs and shortcoming("box", needs):
        ring = "guest"
    return Step(ring, path.stem, command, report, environment, place, needs, **more)


def coverage_steps(out):
    """The tests on libraries that count, and at last what they have counted."""
    counting = BUILD / "coverage"
    counts = {"GCOV_PREFIX": str(out / "coverage")}
    preloaded = {"LD_LIBRARY_PATH": f"{counting / 'src'}:{counting / 'platform'}",
                 "LD_PRELOAD": str(counting / "tests" / "coverage" / "libkova-leave.so")}
    for kind in UNIT_PROGRAMS:
        yield gtest_step(out, "coverage", kind, BUILD, environment={**counts, **preloaded})
    yield pytest_step(out, "coverage", ROOT / "tests" / "coverage" / "test_coverage.py", options=["--capture=no"],
                      environment=counts, shown="coverage of ", last=True)


EMULATOR = ["qemu-aarch64", "-L", "/usr/aarch64-linux-gnu"]
# another processor shows in arithmetic, byte order and the width of numbers; the tests of the rest are slow to emulate
ARM64_SOURCES = ["addr/*.cpp", "dhcp/dhcp_*opt*.cpp", "stats/*.cpp"]
# the platform's tests that neither start programs nor wait for other processes
ARM64_PLATFORM = ["crypt", "error_register", "file_lock", "file_rewrite", "ha", "key_value", "memory", "plain_file",
                  "service", "strings", "sz_hash", "sz_list"]
NOT_EMULATED = ["plain_file.KLIBCFileReadLines_kernelFile_isRead"]  # in /proc the emulator stands under its own name


def arm64_refusal():
    """Why this machine cannot build for 64-bit Arm and run that; empty when it can."""
    if platform.machine() == "aarch64":
        return "this machine's own processor is one, so that every other ring shows it"
    missing = [tool for tool in ("aarch64-linux-gnu-g++", EMULATOR[0]) if not shutil.which(tool)]
    if not (BUILD / "arm64-libraries" / "lib" / "packages").exists():
        missing.append("libraries for it, which lab/prepare unpacks,")
    return f"no {' and no '.join(missing)} on this machine" if missing else ""


def arm64_steps(out):
    refused = arm64_refusal()
    build = BUILD / "arm64"
    yield pytest_step(out, "arm64", ROOT / "tests" / "gates" / "test_arm64.py", refusal=refused)
    units = sorted(path.stem for pattern in ARM64_SOURCES for path in (ROOT / "src").glob(pattern))
    yield gtest_step(out, "arm64", "unit", build, wrapper=EMULATOR, only=units, refusal=refused)
    yield gtest_step(out, "arm64", "platform", build, wrapper=EMULATOR, only=ARM64_PLATFORM, without=NOT_EMULATED,
                     refusal=refused)


def all_steps(out):
    for path in sorted((ROOT / "tests" / "gates").glob("test_*.py")):
        if path.stem == "test_arm64":
            continue  # a ring of its own
        yield pytest_step(out, "gates", path, makes="box" if path.stem in MAKE_BOXES else None)
    for kind in UNIT_PROGRAMS:
        yield gtest_step(out, kind, kind, BUILD)
    yield from fault_steps(out)
    yield gtest_step(out, "crash", "crash", BUILD, shown="kill points of ")
    for kind in UNIT_PROGRAMS:
        yield gtest_step(out, "sanitize", kind, BUILD / "sanitize")
    for kind in UNIT_PROGRAMS:
        yield gtest_step(out, "valgrind", kind, BUILD, wrapper=VALGRIND, without=NOT_UNDER_VALGRIND)
    yield from coverage_steps(out)
    yield from arm64_steps(out)
    yield property_step(out, "random", seed=1, rounds=500)
    for path in sorted((ROOT / "tests" / "lab").glob("test_*.py")):
        ring, makes = OF_THE_LAB_ITSELF.get(path.stem, ("lab", None))
        yield pytest_step(out, ring, path, in_appliance=makes is None, makes=makes)


VALGRIND = ["valgrind", "--quiet", "--error-exitcode=9", "--leak-check=full", "--errors-for-leak-kinds=definite",
            # the tests' own malloc stays in front, so that it can fail; the C library's behind it is the one watched
            "--soname-synonyms=somalloc=nouserintercepts", "--trace-children=no", "--child-silent-after-fork=yes"]


# Valgrind turns vfork into fork, so that a failed execution looks like an exit, stands in /proc under its own name, and
# knows no mount without a type; and it takes time and memory of its own. What tests exactly that runs in the other rings.
NOT_UNDER_VALGRIND = ["exec.*", "popen.*", "process.*", "plain_file.KLIBCFileReadLines_kernelFile_isRead",
                      "dhcp_server_start.DHCPServerRestart_scriptThatCannotBeRun_isNoFailure",
                      "named_lock.KLIBCFileLock_programStartedUnderIt_doesNotKeepIt",
                      "net_is_port_range_used.*_takeTimeInProportion", "net_is_port_range_used.*_takesNoMemory",
                      "file_rewrite.KLIBCFileSetKeyValue_fileThatCannotBeReplaced_isARenameFailure",
                      "file_rewrite.KLIBCFileSetKeyValue_lockDirectoryOfAStranger_isNotUsed"]


def chosen_steps(out, names):
    steps = list(all_steps(out))
    if not names:
        return steps
    chosen = []
    for name in names:
        found = [step for step in steps if step.ring == name] or [step for step in steps if step.name == name]
        if name == "dhcp-fuzz":
            found = [property_step(out, name, seed=random.randrange(2**32), rounds=10000, chosen="dhcp_*")]
        for kind in UNIT_PROGRAMS:
            if not found and name in units_of(kind):
                found = [gtest_step(out, kind, kind, BUILD, unit=name)]
        if not found:
            sys.exit(f"./test: no ring, test file or unit is called {name!r}; ./test --list names them")
        chosen += found
    return chosen


def show(step):
    counts = f"{step.passed} passed" + (f", {step.failed} failed" if step.failed else "") \
        + (f", {step.skipped} skipped" if step.skipped else "")
    place = ", in the guest" if step.backend == "guest" else ""
    verdict = "FAILED" if step.failed else "ok" if step.passed else "-"
    line = f"{verdict:7}{step.ring}/{step.name}: {counts} ({step.seconds:.1f} s{place}) {step.note}"
    print(line.rstrip(), flush=True)
    for reason in step.reasons:
        print(f"       skipped {reason}")
    if step.failed:
        print(step.output, flush=True)
    elif step.shown and step.passed:
        print("".join(f"       {line}\n" for line in step.output.splitlines() if line.startswith(step.shown)), end="",
              flush=True)


def main():
    parser = argparse.ArgumentParser(prog="./test", description=__doc__.split("\n\n")[0],
                                     epilog="\n\n".join(__doc__.split("\n\n")[2:]))
    parser.add_argument("names", nargs="*", metavar="NAME")
    parser.add_argument("--list", action="store_true", help="print the names")
    parser.add_argument("--refresh", action="store_true", help="with fault: record the points that are met now")
    parser.add_argument("--backend", choices=["box", "guest"], help="run there what runs in an appliance")
    asked = parser.parse_args()
    if asked.refresh:
        record_fault_points()
    os.umask(0o022)  # what the tests make is looked at by others than root
    out = pathlib.Path(tempfile.mkdtemp(prefix="kova-test-"))
    try:
        steps = chosen_steps(out, asked.names)
        if asked.list:
            signal.signal(signal.SIGPIPE, signal.SIG_DFL)  # a reader such as head may have seen enough
            print("\n".join(f"{step.ring}/{step.name}" for step in steps))
            print("dhcp-fuzz")
            print("units:", *units_of("unit"), *units_of("platform"))
            return 0
        if not asked.backend and any(step.options is not None for step in steps) and refusal("box"):
            print(f"no boxes here ({refusal('box')}): the guest is taken for everything")
        for step in steps:
            step.place([asked.backend] if asked.backend else ["box", "guest"])
        for ring in sorted({step.ring for step in steps if not step.skipped} & BUILT_ANEW):
            subprocess.run([ROOT / "lab" / "build", f"--{ring}"], check=True)
        for now in ([step for step in steps if not step.last], [step for step in steps if step.last]):
            with concurrent.futures.ThreadPoolExecutor(max_workers=os.cpu_count()) as pool:
                for future in concurrent.futures.as_completed([pool.submit(step.run) for step in now]):
                    show(future.result())
    finally:
        shutil.rmtree(out, ignore_errors=True)
    passed, failed, skipped = (sum(getattr(step, field) for step in steps) for field in ("passed", "failed", "skipped"))
    print(f"{passed} passed, {failed} failed, {skipped} skipped")
    lab_skipped = any(step.skipped for step in steps if step.ring in ("lab", "guest"))
    return 1 if failed or (os.environ.get("CI") and lab_skipped) else 0


if __name__ == "__main__":
    sys.exit(main())
