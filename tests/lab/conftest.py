"""What the lab tests share. They run as root inside the box: on a private root with the appliance's files in place,
wired to the network namespace "net", in which the servers and the other hosts live."""

import contextlib
import json
import os
import pathlib
import pty
import re
import shutil
import signal
import socket
import subprocess
import threading
import time

import pytest

# programs start much slower in a guest, so everything may take longer there
SLOWNESS = 5 if "KOVA_GUEST" in os.environ else 1
KOVANET = "/usr/bin/kovanet"
DOCUMENT = pathlib.Path(__file__).resolve().parents[2] / "docs" / "kovanet-json.md"
DONE, NO, USAGE, NOT_FOUND, CALL_FAILED, NO_PERMISSION = range(6)  # kovanet's exit codes
CONFIG_EXCLUSIVE, CONFIG_NAME = 0x106, 0x100
OTHER_SIDE = ("ip", "netns", "exec", "net")


def pytest_runtest_setup(item):
    # the tests of the lab itself make boxes, from outside
    if "KOVA_BOX" not in os.environ and item.path.name not in ("test_box.py", "test_guest.py"):
        pytest.fail("lab tests write to /etc and /sbin: run them inside the box", pytrace=False)


def wait_for(condition, limit=60.0, what="the condition"):
    """The first true value of condition(); fails the test when it takes longer than limit seconds, which are many more than
    it takes on a busy machine."""
    limit *= SLOWNESS
    end = time.monotonic() + limit
    while True:
        value = condition()
        if value:
            return value
        if time.monotonic() > end:
            pytest.fail(f"{what} did not come within {limit} s")
        time.sleep(0.01)


def run(*command, status=0, **options):
    """Runs a command to its end, captures what it prints and checks its exit status (None: any)."""
    options = {"capture_output": True, "text": True, "timeout": 120 * SLOWNESS, **options}
    done = subprocess.run([str(word) for word in command], check=False, **options)
    assert status is None or done.returncode == status, f"{command}: {done.returncode}\n{done.stdout}{done.stderr}"
    return done


def on_other_side(*command, **options):
    return run(*OTHER_SIDE, *command, **options)


def kovanet(*words, status=DONE, **options):
    done = run(KOVANET, *words, status=status, **options)
    if status == DONE:
        assert done.stderr == ""
    return done


def data(*words, **options):
    """What a command prints with --json: one line."""
    printed = kovanet(*words, "--json", **options).stdout
    assert printed.count("\n") == 1 and printed.endswith("\n")
    return json.loads(printed)


def complaint(*words, status):
    """The line on standard error of a command that fails and prints nothing else."""
    done = kovanet(*words, status=status)
    assert done.stdout == ""
    assert re.fullmatch(r"kovanet: [^\n]+\n", done.stderr), done.stderr
    return done.stderr.removeprefix("kovanet: ").rstrip("\n")


def asked(*words, answer, question="[y/N] "):
    """Runs kovanet on a terminal and answers its question; gives its status and what it says there."""
    master, slave = pty.openpty()
    with subprocess.Popen([KOVANET, *words], stdin=slave, stdout=subprocess.PIPE, stderr=slave, text=True) as process:
        os.close(slave)
        said = ""
        with contextlib.suppress(OSError):  # the terminal is gone when the command is
            while chunk := os.read(master, 4096):
                said += chunk.decode()
                if said.endswith(question):
                    os.write(master, answer)
        os.close(master)
        assert process.stdout.read() == ""
    return process.returncode, said.replace("\r\n", "\n")


def documented(section):
    """The fields that the document names in a section."""
    text = DOCUMENT.read_text().split(f"\n## {section}\n", 1)[1].split("\n## ", 1)[0]
    fields = re.findall(r"^\| `(\w+)` \|", text, re.MULTILINE)
    assert fields
    return fields


@contextlib.contextmanager
def held_configuration_lock():
    """Another program that is changing the network."""
    program = ("import ctypes; core = ctypes.CDLL('libkovacore.so.6');"
               f"print(core.KLIBCFileLock({CONFIG_EXCLUSIVE}, 5), flush=True); input()")
    other = subprocess.Popen(["/usr/bin/python3", "-c", program], stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True)
    try:
        assert other.stdout.readline() == "0\n"
        yield
    finally:
        other.communicate("\n", timeout=60)


def keys_of(path):
    return dict(line.split("=", 1) for line in path.read_text().splitlines() if "=" in line)


class Daemon:
    """A process that serves a test: started, waited for until it is ready, ended by its pid."""

    def __init__(self, command, ready, limit=60.0):
        self.process = subprocess.Popen([str(word) for word in command], stdin=subprocess.DEVNULL)
        try:
            wait_for(lambda: self.is_ready(ready), limit, f"{command[0]}'s start")
        except BaseException:
            self.stop()
            raise

    def is_ready(self, ready):
        assert self.process.poll() is None, f"ended with {self.process.returncode} before it was ready"
        return ready()

    def stop(self):
        self.process.terminate()
        try:
            self.process.wait(20 * SLOWNESS)
        except subprocess.TimeoutExpired:
            self.process.kill()
            self.process.wait()

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self.stop()


class DhcpServer(Daemon):
    """dnsmasq on the other side of a link: serves NETWORK.10 to NETWORK.20, has NETWORK.1 itself."""

    def __init__(self, link, network, *more, folder):
        on_other_side("ip", "addr", "replace", f"{network}.1/24", "dev", link)
        self.log = folder / f"dnsmasq.{link}.log"
        command = [
            *OTHER_SIDE, "dnsmasq", "--no-daemon", "--conf-file=/dev/null", f"--interface={link}",
            "--bind-interfaces", f"--dhcp-range={network}.10,{network}.20,255.255.255.0,600", "--dhcp-authoritative",
            "--no-ping", "--log-dhcp", "--user=root", "--group=root", "--port=0", f"--log-facility={self.log}",
            f"--dhcp-leasefile={folder}/leases.{link}", f"--pid-file={folder}/dnsmasq.{link}.pid", *more,
        ]  # fmt: skip
        super().__init__(command, lambda: "sockets bound" in self.text())

    def text(self):
        return self.log.read_text() if self.log.exists() else ""


class SystemLog:
    """Listens on /dev/log and keeps every message, as "<priority>... text"."""

    MARK = b"all before this has been received"

    def __init__(self):
        self.messages, self.caught_up = [], threading.Event()
        self.socket = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
        self.socket.bind("/dev/log")
        self.thread = threading.Thread(target=self.receive)
        self.thread.start()

    def receive(self):
        while message := self.socket.recv(65536):
            if message == self.MARK:
                self.caught_up.set()
            else:
                self.messages.append(message.decode(errors="replace"))

    def send(self, message):
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as end:
            end.sendto(message, "/dev/log")

    def holds(self, text):
        """Whether a text is in one of the messages that have been sent so far, also those on their way."""
        self.caught_up.clear()
        self.send(self.MARK)
        assert self.caught_up.wait(60 * SLOWNESS)
        return any(text in message for message in self.messages)

    def close(self):
        self.send(b"")
        self.thread.join()
        self.socket.close()
        os.unlink("/dev/log")


class HeldProgram:
    """Puts a script in a program's place: the first run whose arguments hold a text waits until it is released."""

    def __init__(self, program, text, folder):
        self.program, self.before = pathlib.Path(program), folder / "real" / pathlib.Path(program).name
        self.first, self.held = folder / "first", folder / "held"
        self.before.parent.mkdir()
        self.held.touch()
        shutil.move(self.program, self.before)
        self.program.write_text(
            f"#!/bin/sh\ncase \"$*\" in *'{text}'*)\n    mkdir {self.first} 2>/dev/null &&\n"
            f"        while [ -e {self.held} ]; do sleep 0.02; done ;;\nesac\nexec {self.before} \"$@\"\n"
        )
        self.program.chmod(0o755)

    def is_waiting(self):
        return self.first.exists()

    def release(self):
        self.held.unlink(missing_ok=True)

    def put_back(self):
        self.release()
        self.program.unlink()
        shutil.move(self.before, self.program)


@pytest.fixture
def hold(tmp_path):
    """hold(program, text): a HeldProgram until the test ends."""
    held = []

    def put(program, text):
        held.append(HeldProgram(program, text, tmp_path))
        return held[-1]

    yield put
    for program in held:
        program.put_back()


@pytest.fixture
def system_log():
    log = SystemLog()
    yield log
    log.close()


def addresses(link):
    """The IPv4 addresses of an interface, as "a.b.c.d/prefix"."""
    return re.findall(r"inet (\S+)", run("ip", "-4", "addr", "show", "dev", link).stdout)


def routes(*selection):
    return [line.strip() for line in run("ip", "-4", "route", "show", *selection).stdout.splitlines()]


def wait_for_partner(address="192.168.90.1"):
    wait_for_answer(address)


def is_up(link):
    return bool(int(pathlib.Path(f"/sys/class/net/{link}/flags").read_text(), 16) & 1)


def processes(text):
    """Pids of the living processes whose command line holds a text; zombies have none, and neither have those that are just
    about to end, with their files and locks still open."""
    found = []
    for folder in pathlib.Path("/proc").glob("[0-9]*"):
        try:
            if text in (folder / "cmdline").read_bytes().replace(b"\0", b" ").decode(errors="replace"):
                found.append(int(folder.name))
        except (FileNotFoundError, ProcessLookupError):
            continue
    return found


def process(text):
    """Pid of the only process whose command line holds a text. What it starts looks like it until it is another program."""
    [pid] = wait_for(lambda: found if len(found := processes(text)) == 1 else None, what=f"one process with {text}")
    return pid


def wait_for_answer(address, *where):
    """Pings until there is an answer: the first ones come too early where the other side is not ready, and are lost."""
    command = (*where, "ping", "-c", "1", "-W", "1", address)
    wait_for(lambda: run(*command, status=None).returncode == 0, what=f"an answer of {address}")


def kill(pids):
    """Kills processes and waits until nothing is left of them; somebody else is their parent."""
    for pid in pids:
        with contextlib.suppress(ProcessLookupError):
            os.kill(pid, signal.SIGKILL)
    wait_for_end(pids)


def wait_for_end(pids):
    """Waits until processes are gone, with all that they had open."""
    wait_for(lambda: not any(pathlib.Path(f"/proc/{pid}").exists() for pid in pids), what=f"the end of {pids}")


@pytest.fixture
def keep():
    """keep(path): gives a file its text and mode back, or its absence, when the test ends."""
    kept = []

    def remember(path):
        path = pathlib.Path(path)
        kept.append((path, (path.read_bytes(), path.stat().st_mode) if path.exists() else None))
        return path

    yield remember
    for path, before in reversed(kept):
        if before is None:
            path.unlink(missing_ok=True)
        else:
            path.write_bytes(before[0])
            path.chmod(before[1])


@pytest.fixture
def partner():
    """partner(kind): the other side of links as one bridge or bond "uplink" with the address 192.168.90.1."""
    used = set()

    def make(kind, links=("lan0", "lan1")):
        used.update(links)
        on_other_side("ip", "link", "del", "uplink", status=None)
        more = " miimon 50" if kind.startswith("bond") else ""
        joined = "".join(f"link set {link} down\nlink set {link} master uplink\nlink set {link} up\n" for link in links)
        on_other_side("ip", "-batch", "-", input=f"link add uplink type {kind}{more}\n{joined}link set uplink up\n"
                                                 "addr add 192.168.90.1/24 dev uplink\n")  # fmt: skip

    yield make
    on_other_side("ip", "-batch", "-", input="link del uplink\n" + "".join(f"link set {link} up\n" for link in used))
