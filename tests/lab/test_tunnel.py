# box:
# needs: tun
"""The IPv6 tunnel: real packets to a broker and back; brokers that refuse, are slow, hang, go away; kovanet tunnel."""

import contextlib
import ctypes
import os
import pathlib
import pty
import re
import signal
import stat
import subprocess
import sys
import termios
import threading
import time

import pytest
from conftest import (CALL_FAILED, DONE, KOVANET, NO, NO_PERMISSION, SLOWNESS, USAGE, asked, complaint, data, documented, kovanet,
                      on_other_side, process, processes, run, wait_for)
from sdk import library
from tunnel_lab import (ACCOUNT, CLIENT, CONF, GOGOC, NEAR, PASSWORD, RUN_KEY, SECRET, SERVER, LabBroker, TunnelConf, account,
                        addresses, anonymous, expect_tunnel)

START, STOP, RESTART = range(3)
TIMEOUT = 45  # seconds that the library waits


@pytest.fixture
def broker(tmp_path):
    with LabBroker(tmp_path) as one:
        yield one


@pytest.fixture(autouse=True)
def appliance(keep, tmp_path, monkeypatch):
    """Wired and without an account; neither client nor configuration is left, whatever a test does."""
    for path in (ACCOUNT, RUN_KEY, PASSWORD):
        keep(path)
    monkeypatch.chdir(tmp_path)  # where a client leaves its files
    on_other_side("ip", "addr", "replace", f"{SERVER}/24", "dev", "eth0")
    run("ip", "addr", "replace", "192.168.50.10/24", "dev", "eth0")
    yield
    if processes(CLIENT):
        run(GOGOC / "rc.tun", "stop", status=None)
    assert not CONF.exists()
    assert wait_for(lambda: not processes(CLIENT), what="the client's end")
    assert not list(GOGOC.glob(".gogoc.conf*"))
    run("ip", "addr", "flush", "dev", "eth0", "scope", "global")
    on_other_side("ip", "addr", "flush", "dev", "eth0", "scope", "global")


def execute(action, conf=None):
    return library.KOVATunnelExecute(action, ctypes.byref(conf) if conf is not None else None)


class Reader:
    """Somebody else on the appliance, who reads what he can of the secrets and of all command lines."""

    def __init__(self, *patterns):
        self.patterns, self.found, self.running = patterns, set(), True
        self.thread = threading.Thread(target=self.look)

    def look(self):
        while self.running:
            for path in (path for pattern in self.patterns for path in GOGOC.glob(pattern)):
                with contextlib.suppress(FileNotFoundError):
                    status = path.stat()
                    if status.st_mode & 0o077 and status.st_size:
                        self.found.add(str(path))
            if any(SECRET in line for line in command_lines()):
                self.found.add("a command line")

    def __enter__(self):
        self.thread.start()
        return self

    def __exit__(self, *_):
        self.running = False
        self.thread.join()


def command_lines():
    for folder in pathlib.Path("/proc").glob("[0-9]*"):
        with contextlib.suppress(FileNotFoundError, ProcessLookupError):
            yield (folder / "cmdline").read_bytes().decode(errors="replace")


# ---- the library ----------------------------------------------------------------------------------------------------


def test_a_login_brings_up_a_tunnel_that_carries_packets(broker, system_log):
    with Reader(PASSWORD.name + "*", "*gogoc.conf*") as reader:
        assert library.KOVATunnelConfigSet(ctypes.byref(account())) == 0
        assert execute(START) == 0
        assert not CONF.exists()
        expect_tunnel()
    assert reader.found == set()
    assert broker.said("login of alice") and not broker.said(SECRET)
    assert SECRET.encode() not in PASSWORD.read_bytes() and stat.S_IMODE(PASSWORD.stat().st_mode) == 0o600
    assert system_log.holds("tunnel connection setup") and not system_log.holds(SECRET)


def test_an_anonymous_login_needs_no_account(broker):
    assert execute(START, anonymous()) == 0
    expect_tunnel()
    assert broker.said("hello anonymous") and not broker.said("login")


def test_the_default_route_leads_through_the_tunnel_behind_all_others(broker):
    assert execute(START, anonymous()) == 0
    assert "dev tun metric 4096" in run("ip", "-6", "route", "show", "default").stdout


def test_a_stop_takes_the_tunnel_down(broker):
    assert execute(START, anonymous()) == 0
    assert execute(STOP) == 0
    assert addresses() == [] and not pathlib.Path("/sys/class/net/tun").exists() and not processes(CLIENT)
    assert wait_for(lambda: broker.said(f"bye of {NEAR}"), what="the farewell")
    assert execute(STOP) == 0  # there is nothing to stop


def test_a_restart_makes_a_new_tunnel(broker):
    assert execute(START, anonymous()) == 0
    first = process(CLIENT)
    assert execute(RESTART, account()) == 0
    second = process(CLIENT)
    assert first != second and broker.said("login of alice")
    expect_tunnel()


def test_a_second_start_leaves_the_tunnel_as_it_is(broker):
    assert execute(START, anonymous()) == 0
    first = process(CLIENT)
    assert execute(START, account()) == 0
    assert process(CLIENT) == first and not CONF.exists()
    expect_tunnel()


@pytest.mark.parametrize("action", (START, RESTART))
def test_a_refused_login_ends_the_client(broker, system_log, action):
    for conf in (account(password="wrong"), account(user="mallory"), account(password="")):
        assert execute(action, conf) == 0
        assert not processes(CLIENT) and addresses() == [] and not CONF.exists()
    broker.be(mode="refuse")
    assert execute(action, anonymous()) == 0
    assert not processes(CLIENT) and addresses() == []
    wait_for(lambda: system_log.holds("the tunnel broker refuses: wrong user or password"))
    wait_for(lambda: system_log.holds("the tunnel broker refuses: not here"))


def test_users_and_passwords_of_every_kind_reach_the_broker(broker):
    names = ("*", "a*b", "in side", " around ", '"quoted"', "it's", "tab\tin", "ü€", "a=b", "#x", "$(reboot)", "x" * 255)
    passwords = ("*", "in side", '"q"', "a=b", "tab\tin", "ü€", "\x01\x7f", "x" * 31, " p ", "'", "\\n", "")
    broker.be(accounts=dict(zip(names, passwords)))
    for name, password in zip(names, passwords):
        assert library.KOVATunnelConfigSet(ctypes.byref(account(name, password))) == 0
        assert execute(RESTART) == 0
        assert addresses() == [f"{NEAR}/64"], name
        assert execute(STOP) == 0
        wait_for(lambda: broker.said(f"bye of {NEAR}"))


def test_a_slow_broker_is_waited_for(broker):
    broker.be(delay=3)
    begin = time.monotonic()
    assert execute(START, account()) == 0
    assert time.monotonic() - begin > 5  # it answers twice
    expect_tunnel()


def test_a_restart_gives_up_where_nobody_listens(system_log):
    assert execute(RESTART, anonymous()) == 0
    assert not processes(CLIENT) and not CONF.exists()
    assert system_log.holds("excute command /etc/gogoc/rc.tun restart failed")


def test_a_restart_with_a_broker_that_hangs_kills_the_client(broker, system_log):
    broker.be(mode="hang")
    begin = time.monotonic()
    assert execute(RESTART, account()) == -1
    assert time.monotonic() - begin > TIMEOUT - 1
    assert wait_for(lambda: not processes(CLIENT), what="the client's end")
    assert not CONF.exists() and system_log.holds("gogoc hangs, terminate it.")
    assert not system_log.holds(SECRET)


def test_a_start_with_a_broker_that_hangs_goes_on_and_gets_its_tunnel_later(broker, system_log):
    broker.be(mode="hang")
    assert execute(START, account()) == 0
    assert processes(CLIENT) and addresses() == [] and not CONF.exists()
    assert system_log.holds("connecting to tunnel broker timeout")
    broker.be(mode="serve")
    wait_for(addresses, limit=90, what="the tunnel")
    expect_tunnel()
    assert execute(STOP) == 0


def test_a_broker_that_goes_away_gets_its_client_back(tmp_path):
    with LabBroker(tmp_path):
        assert execute(START, anonymous()) == 0
        assert addresses()
    wait_for(lambda: not addresses(), what="the end of the tunnel")
    assert processes(CLIENT)
    with LabBroker(tmp_path):
        wait_for(addresses, what="the tunnel")
        expect_tunnel()
        assert execute(STOP) == 0


def test_a_broker_may_refer_to_another(broker, tmp_path):
    with LabBroker(tmp_path, 3654, mode="refer", others=[SERVER], device="other", prefix="2001:db8:8") as first:
        assert execute(START, account(server=f"{SERVER}:3654")) == 0
        assert first.said("hello user")
    expect_tunnel()
    assert (tmp_path / "tsp-broker-list.txt.bak").read_text() == f"{SERVER}\n"
    assert not (tmp_path / "tsp-broker-list.txt").exists()


def test_the_script_goes_on_when_its_caller_is_killed(broker, hold):
    held = hold(GOGOC / "rc.tun", "start")
    program = (f"import ctypes; ctypes.CDLL('libkovanetsdk.so.6').KOVATunnelExecute(0, {bytes(account())!r})")
    with subprocess.Popen([sys.executable, "-c", program]) as caller:
        wait_for(held.is_waiting)
        assert stat.S_IMODE(CONF.stat().st_mode) == 0o600
        caller.send_signal(signal.SIGKILL)
    held.release()
    wait_for(addresses, what="the tunnel")
    assert wait_for(lambda: not CONF.exists(), what="the end of the configuration")


def test_the_configuration_goes_when_the_process_with_the_script_is_killed(broker, hold):
    held = hold(GOGOC / "rc.tun", "start")
    program = (f"import ctypes; print(ctypes.CDLL('libkovanetsdk.so.6').KOVATunnelExecute(0, {bytes(account())!r}))")
    with subprocess.Popen([sys.executable, "-c", program], stdout=subprocess.PIPE, text=True) as caller:
        wait_for(held.is_waiting)
        script = process(f"{GOGOC}/rc.tun start")
        worker = int(re.search(r"PPid:\s+(\d+)", pathlib.Path(f"/proc/{script}/status").read_text())[1])
        assert worker != caller.pid and os.getsid(worker) == worker
        os.kill(worker, signal.SIGKILL)
        assert caller.stdout.read() == "0\n"
    assert not CONF.exists()
    held.release()
    wait_for(lambda: not processes(f"{GOGOC}/rc.tun start"), what="the script's end")


def test_a_running_relay_is_reloaded(broker, system_log):
    run("/sbin/start", "kovarelayd")
    try:
        wait_for(lambda: run("/usr/kova/service/kovarelayd", "status", status=None).returncode == 0)
        assert execute(START, anonymous()) == 0
        wait_for(lambda: any("kovarelayd" in line and "reload" in line for line in system_log.messages))
    finally:
        run("/sbin/stop", "kovarelayd")


# ---- kovanet --------------------------------------------------------------------------------------------------------


def stored():
    """The account as the library reads it."""
    conf = TunnelConf()
    assert library.KOVATunnelConfigGet(ctypes.byref(conf)) >= 0
    return conf.blAnonymous, conf.szServer.decode(), conf.szUserId.decode(), conf.szPassword.decode()


def secret_file(folder, text):
    path = folder / "password"
    path.write_bytes(text.encode() if isinstance(text, str) else text)
    return path


def test_kovanet_goes_the_whole_way(broker, tmp_path):
    assert complaint("tunnel", "start", status=NO) == "no tunnel broker is configured; first: kovanet tunnel set"
    kovanet("tunnel", "set", SERVER, "login", "alice", "--password-file", secret_file(tmp_path, SECRET + "\n"))
    assert stored() == (0, SERVER, "alice", SECRET)
    expected = {"state": "down", "enabled": False, "server": SERVER, "login": "user", "user": "alice", "addresses": []}
    assert data("tunnel", "show") == expected and list(expected) == documented("kovanet tunnel show")
    kovanet("tunnel", "start")
    expect_tunnel()
    assert data("tunnel", "show") == {**expected, "state": "up", "enabled": True, "addresses": [f"{NEAR}/64"]}
    assert kovanet("tunnel", "show").stdout == ("state:     up\nenabled:   yes\nserver:    192.168.50.1\nlogin:     user\n"
                                                "user:      alice\naddresses: 2001:db8:7::2/64\n")
    kovanet("tunnel", "set", SERVER, "anonymous")
    kovanet("tunnel", "restart")
    assert broker.said("hello anonymous")
    expect_tunnel()
    kovanet("tunnel", "stop")
    assert data("tunnel", "show") == {**expected, "login": "anonymous", "user": None}
    assert not list(GOGOC.glob("tsp-*"))


def test_kovanet_tells_when_there_is_no_tunnel(broker, tmp_path):
    kovanet("tunnel", "set", SERVER, "login", "alice", "--password-file", secret_file(tmp_path, "wrong"))
    for verb in ("start", "restart"):
        assert complaint("tunnel", verb, status=CALL_FAILED).startswith("the tunnel is not up: the broker refused")
    assert data("tunnel", "show")["enabled"] is True


def test_kovanet_takes_passwords_from_a_file_a_descriptor_and_a_terminal(tmp_path):
    words = ("tunnel", "set", SERVER, "login", "alice")
    for given, password in (("p", "p"), ("p\n", "p"), ("p\r\n", "p"), (" p* \n", " p* "), ("x" * 31, "x" * 31),
                            ("ü€", "ü€"), ("\"'", "\"'")):  # fmt: skip
        kovanet(*words, "--password-file", secret_file(tmp_path, given))
        assert stored() == (0, SERVER, "alice", password)
        kovanet(*words, "--password-file", secret_file(tmp_path, "other"))
        kovanet(*words, "--password-fd", "0", input=given)
        assert stored() == (0, SERVER, "alice", password)
    status, said = asked(*words, answer=f"{SECRET}\n".encode(), question="Password: ")
    assert (status, said) == (DONE, "Password: \n") and stored()[3] == SECRET
    kovanet("tunnel", "set", "other.example", "login", "bob", "--keep-password")
    assert stored() == (0, "other.example", "bob", SECRET)


def test_kovanet_keeps_no_password_where_none_is_stored(tmp_path):
    kovanet("tunnel", "set", SERVER, "login", "alice", "--password-file", secret_file(tmp_path, SECRET))
    before = PASSWORD.read_bytes()
    kovanet("tunnel", "set", SERVER, "anonymous")
    text = complaint("tunnel", "set", SERVER, "login", "alice", "--keep-password", status=NO)
    assert text == "no password is kept; give one"
    assert PASSWORD.read_bytes() == before and stored()[0] == 1
    kovanet("tunnel", "set", SERVER, "login", "alice", "--password-file", secret_file(tmp_path, SECRET))
    for empty in ("", "\n", "\r\n"):
        assert "empty" in complaint("tunnel", "set", SERVER, "login", "bob", "--password-file", secret_file(tmp_path, empty),
                                    status=NO)  # fmt: skip
    assert stored() == (0, SERVER, "alice", SECRET)


def test_kovanet_asks_anew_when_it_was_stopped():
    master, slave = pty.openpty()
    os.set_blocking(master, False)
    said = b""

    def is_asked(times):
        nonlocal said
        with contextlib.suppress(BlockingIOError):
            said += os.read(master, 4096)
        return said.count(b"Password: ") == times

    def is_stopped():
        process.send_signal(signal.SIGTSTP)  # again: it may not wait for what is typed yet
        return pathlib.Path(f"/proc/{process.pid}/stat").read_text().split()[2] == "T"

    # of a group of its own, as a shell's job is: others are not stopped
    process = subprocess.Popen([KOVANET, "tunnel", "set", SERVER, "login", "alice"], stdin=slave, stderr=slave,
                               process_group=0)  # fmt: skip
    try:
        wait_for(lambda: is_asked(1), what="the question")
        wait_for(is_stopped, what="the stop")
        assert termios.tcgetattr(slave)[3] & termios.ECHO
        process.send_signal(signal.SIGCONT)
        wait_for(lambda: is_asked(2), what="the question again")
        os.write(master, b"typed-word\n")
        assert process.wait(20 * SLOWNESS) == DONE
        assert stored()[3] == "typed-word"
    finally:
        process.kill()
        process.wait()
        os.close(master)
        os.close(slave)


def test_kovanet_leaves_the_terminal_as_it_was_when_it_is_interrupted():
    before = stored()
    master, slave = pty.openpty()

    def is_shown():
        return bool(termios.tcgetattr(slave)[3] & termios.ECHO)

    try:
        with subprocess.Popen([KOVANET, "tunnel", "set", SERVER, "login", "alice"], stdin=slave, stderr=slave) as process:
            wait_for(lambda: not is_shown(), what="a silent terminal")
            os.write(master, b"half a pass")
            process.send_signal(signal.SIGINT)
            assert process.wait(60) == -signal.SIGINT
        assert is_shown() and stored() == before
        assert b"half" not in os.read(master, 4096)
    finally:
        os.close(master)
        os.close(slave)


def test_kovanet_refuses_passwords_that_are_none(tmp_path):
    words = ("tunnel", "set", SERVER, "login", "alice")
    before = stored()
    for bad in ("x" * 30, "x" * 5000, "\nb", "\n\n", "\tb", "\0b", "\x7f"):
        assert "zq" not in complaint(*words, "--password-file", secret_file(tmp_path, "zq" + bad), status=NO)
    assert complaint(*words, "--password-file", tmp_path / "absent", status=NO).startswith("cannot read the password from")
    assert complaint(*words, "--password-file", tmp_path, status=NO).startswith("cannot read the password from")
    for number in ("x", "0x0", "-1", "4294967296"):
        assert "is not valid: it is a number" in complaint(*words, "--password-fd", number, status=NO)
    assert complaint(*words, "--password-fd", "99", status=NO).startswith("cannot read the password from descriptor 99")
    assert "no terminal" in complaint(*words, status=USAGE)
    assert stored() == before


def test_kovanet_takes_no_password_from_the_command_line():
    before = stored()
    done = run(KOVANET, "tunnel", "set", SERVER, "login", "alice", SECRET, status=USAGE)
    assert SECRET not in done.stdout + done.stderr and "there are too many words" in done.stderr
    for words in (("--password", SECRET), (f"--password={SECRET}",)):
        done = run(KOVANET, "tunnel", "set", SERVER, "login", "alice", *words, status=USAGE)
        assert SECRET not in done.stdout + done.stderr and "command line" in done.stderr
    assert stored() == before


def test_kovanet_refuses_accounts_that_are_none(tmp_path):
    password = ("--password-file", secret_file(tmp_path, "p"))
    before = stored()
    for server in ("", "x" * 256, "two words", "tab\t", "line\nend", "\x7f"):
        assert "tunnel broker" in complaint("tunnel", "set", server, "anonymous", status=NO)
    for user in ("x" * 256, "tab\tin", "line\nend", "\x01"):
        assert "user" in complaint("tunnel", "set", SERVER, "login", user, *password, status=NO)
    for words in (("login",), ("anonymous", "alice"), ("guest",), ("anonymous", *password), ("anonymous", "--keep-password"),
                  ("login", "alice", "--keep-password", *password)):  # fmt: skip
        complaint("tunnel", "set", SERVER, *words, status=USAGE)
    for words in ("show", f"set {SERVER} anonymous", "start", "stop", "restart"):
        done = run("unshare", "--user", KOVANET, "tunnel", *words.split(), status=NO_PERMISSION)
        assert done.stdout == "" and "needs root" in done.stderr
    assert stored() == before
    kovanet("tunnel", "set", SERVER, "login", "in side*", *password)
    assert stored()[2] == "in side*"
