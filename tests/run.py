#!/usr/bin/env python3
"""Runs the rings of the proof and adds up their results.

usage: ./test [--list] [--backend box|guest] [NAME...]

A NAME is a ring (unit, platform, sanitize, valgrind, lab, guest, gates), a test file (test_jobs, test_abi) or a source
unit (net_set_ip); without a name everything runs. The last line counts the test cases.

A lab test names in a line "# needs:" what its kernel has to have. It runs in the box where this machine's kernel has that,
otherwise in the guest (ring guest); where boxes are refused everything runs in the guest.
"""
import argparse
import concurrent.futures
import functools
import os
import pathlib
import shutil
import subprocess
import sys
import tempfile
import time
import xml.etree.ElementTree as xml

ROOT = pathlib.Path(__file__).resolve().parent.parent
BUILD = ROOT / "build"
BOX = BUILD / "lab" / "kova-box"
PYTHON = "/usr/bin/python3"
UNIT_PROGRAMS = {"unit": "tests/kovanet-unit-tests", "platform": "tests/platform/kova-platform-tests"}
SLOWEST = 900  # seconds for one step


# what a test can need, and a command that succeeds where the kernel has it; "probe" is deleted afterwards
KERNEL_PARTS = {
    "bonding": "ip link add probe type bond",
    "bridge": "ip link add probe type bridge",
    "dummy": "ip link add probe type dummy",
    "openvswitch": "test -d /sys/module/openvswitch || modprobe openvswitch",
    "ppp": "test -c /dev/ppp && exec 3<>/dev/ppp",
    "pppoe": f"{PYTHON} -c 'import socket; socket.socket(24, socket.SOCK_STREAM, 0)'",
    "sit": "ip link add probe type sit local 192.0.2.1 remote 192.0.2.2",
    "tun": "ip tuntap add dev probe mode tun",
    "veth": "ip link add probe type veth peer name probe2",
    "vlan": "ip link add link eth0 name probe type vlan id 5",
}
OF_THE_LAB_ITSELF = {"test_box": ("lab", "box"), "test_guest": ("guest", "guest")}  # file -> ring, what it makes itself
NOT_IN_GUEST = {"sanitize": "sanitizers do not run on its kernel", "valgrind": "valgrind does not run on its kernel"}


def in_backend(backend, options, command):
    return [str(BOX), *(["--guest"] if backend == "guest" else []), *options, "--", *command]


@functools.cache
def refusal(backend):
    """Why a backend cannot be had on this machine; empty when it can."""
    tried = subprocess.run(in_backend(backend, [], ["true"]), stdin=subprocess.DEVNULL, stdout=subprocess.PIPE,
                           stderr=subprocess.STDOUT, text=True, errors="replace")
    return (tried.stdout.splitlines() or [f"status {tried.returncode}"])[0] if tried.returncode else ""


@functools.cache
def parts_of(backend):
    """Of KERNEL_PARTS, what a backend's kernel has."""
    script = "".join(f"if ({probe}) >/dev/null 2>&1; then echo {part}; ip link del probe 2>/dev/null; fi\n"
                     for part, probe in KERNEL_PARTS.items())
    return frozenset(subprocess.run(in_backend(backend, [], ["sh", "-c", script]), stdin=subprocess.DEVNULL,
                                    stdout=subprocess.PIPE, text=True).stdout.split())


def shortcoming(backend, needs):
    """Why a backend is of no use for what needs parts of a kernel; empty when it is of use."""
    missing = sorted(needs - parts_of(backend)) if needs and not refusal(backend) else []
    return refusal(backend) or (f"no {', '.join(missing)} in its kernel" if missing else "")


class Step:
    """One test program in one backend (or on the host), whose results come as a JUnit file."""

    def __init__(self, ring, name, command, report, environment=None, options=None, needs=frozenset(),
                 makes=None):
        self.ring, self.name, self.command, self.report = ring, name, command, report
        self.environment = {**os.environ, **(environment or {})}
        self.options, self.needs = options, needs  # of the box; None on the host
        self.makes = makes  # the backend that the tests start themselves
        self.backend, self.reasons, self.seconds = None, [], 0.0
        self.passed = self.failed = self.skipped = 0

    def place(self, backends):
        """Chooses the first backend that has what the step needs."""
        if self.options is None:
            if self.makes and refusal(self.makes):
                self.skip(f"{self.makes}: {refusal(self.makes)}")
            return
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
            done = subprocess.run(self.command, cwd=ROOT, env=self.environment, stdin=subprocess.DEVNULL,
                                  stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True, errors="replace",
                                  timeout=SLOWEST + 60)  # a box ends by itself before
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


def gtest_step(out, ring, kind, build, unit=None, wrapper=(), without=()):
    program = build / UNIT_PROGRAMS[kind]
    report = out / f"{ring}-{kind}-{unit or 'all'}.xml"
    chosen = f"{unit}.*" if unit else "*"
    command = [*wrapper, str(program), f"--gtest_output=xml:{report}", "--gtest_brief=1",
               f"--gtest_filter={chosen}{'-' + ':'.join(without) if without else ''}"]
    return Step(ring, f"{kind}{'/' + unit if unit else ''}", command, report, options=["--share", str(out)])


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


def pytest_step(out, ring, path, in_appliance=False, makes=None):
    """A file of tests, on the host, or in an appliance that has what its "# box:" and "# needs:" lines ask for."""
    report = out / f"{path.stem}.xml"
    command = [PYTHON, "-B", "-m", "pytest", "-q", "-p", "no:cacheprovider", f"--junitxml={report}", str(path)]
    environment = {"KOVA_BUILD": str(BUILD), "KOVA_BOX_PROGRAM": str(BOX)}
    if not in_appliance:
        return Step(ring, path.stem, command, report, environment, makes=makes)
    options = ["--share", str(out), "--tree", str(BUILD / "stage"), *header(path, "box")]
    needs = needs_of(path)
    if needs and shortcoming("box", needs):
        ring = "guest"
    return Step(ring, path.stem, command, report, environment, options, needs)


def all_steps(out):
    for path in sorted((ROOT / "tests" / "gates").glob("test_*.py")):
        yield pytest_step(out, "gates", path)
    for kind in UNIT_PROGRAMS:
        yield gtest_step(out, kind, kind, BUILD)
    for kind in UNIT_PROGRAMS:
        yield gtest_step(out, "sanitize", kind, BUILD / "sanitize")
    for kind in UNIT_PROGRAMS:
        yield gtest_step(out, "valgrind", kind, BUILD, wrapper=VALGRIND, without=NOT_UNDER_VALGRIND)
    for path in sorted((ROOT / "tests" / "lab").glob("test_*.py")):
        ring, makes = OF_THE_LAB_ITSELF.get(path.stem, ("lab", None))
        yield pytest_step(out, ring, path, in_appliance=makes is None, makes=makes)


VALGRIND = ["valgrind", "--quiet", "--error-exitcode=9", "--leak-check=full", "--errors-for-leak-kinds=definite",
            # the tests' own malloc stays in front, so that it can fail; the C library's behind it is the one watched
            "--soname-synonyms=somalloc=nouserintercepts", "--trace-children=no", "--child-silent-after-fork=yes"]


# Valgrind turns vfork into fork, so that a failed execution looks like an exit, stands in /proc under its own name, and
# knows no mount without a type. What tests exactly that runs in the other rings.
NOT_UNDER_VALGRIND = ["exec.*", "popen.*", "process.*", "plain_file.KLIBCFileReadLines_kernelFile_isRead",
                      "named_lock.KLIBCFileLock_programStartedUnderIt_doesNotKeepIt",
                      "file_rewrite.KLIBCFileSetKeyValue_fileThatCannotBeReplaced_isARenameFailure",
                      "file_rewrite.KLIBCFileSetKeyValue_lockDirectoryOfAStranger_isNotUsed"]


def chosen_steps(out, names):
    steps = list(all_steps(out))
    if not names:
        return steps
    chosen = []
    for name in names:
        found = [step for step in steps if step.ring == name] or [step for step in steps if step.name == name]
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
    print(f"{verdict:7}{step.ring}/{step.name}: {counts} ({step.seconds:.1f} s{place})", flush=True)
    for reason in step.reasons:
        print(f"       skipped {reason}")
    if step.failed:
        print(step.output, flush=True)


def main():
    parser = argparse.ArgumentParser(prog="./test", description=__doc__.split("\n\n")[0],
                                     epilog="\n\n".join(__doc__.split("\n\n")[2:]))
    parser.add_argument("names", nargs="*", metavar="NAME")
    parser.add_argument("--list", action="store_true", help="print the names")
    parser.add_argument("--backend", choices=["box", "guest"], help="run there what runs in an appliance")
    asked = parser.parse_args()
    out = pathlib.Path(tempfile.mkdtemp(prefix="kova-test-"))
    try:
        steps = chosen_steps(out, asked.names)
        if asked.list:
            print("\n".join(f"{step.ring}/{step.name}" for step in steps))
            print("units:", *units_of("unit"), *units_of("platform"))
            return 0
        if not asked.backend and any(step.options is not None for step in steps) and refusal("box"):
            print(f"no boxes here ({refusal('box')}): the guest is taken for everything")
        for step in steps:
            step.place([asked.backend] if asked.backend else ["box", "guest"])
        with concurrent.futures.ThreadPoolExecutor(max_workers=os.cpu_count()) as pool:
            for future in concurrent.futures.as_completed([pool.submit(step.run) for step in steps]):
                show(future.result())
    finally:
        shutil.rmtree(out, ignore_errors=True)
    passed, failed, skipped = (sum(getattr(step, field) for step in steps) for field in ("passed", "failed", "skipped"))
    print(f"{passed} passed, {failed} failed, {skipped} skipped")
    lab_skipped = any(step.skipped for step in steps if step.ring in ("lab", "guest"))
    return 1 if failed or (os.environ.get("CI") and lab_skipped) else 0


if __name__ == "__main__":
    sys.exit(main())
