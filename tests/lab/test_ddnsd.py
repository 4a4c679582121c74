# box: --link eth0
"""The dynamic-DNS daemon and its service script, asked over the network for the external address."""

import os
import pathlib
import signal
import subprocess
import sys
import time

import pytest
from conftest import OTHER_SIDE, SLOWNESS, Daemon, on_other_side, processes, run, wait_for

DDNSD = "/usr/kova/sbin/ddnsd"
SERVICE = "/usr/kova/service/ddns"
SETTINGS = pathlib.Path("/etc/kova/ddns.conf")
RESULT = pathlib.Path("/run/ddns/externalIP.result")
PID_FILE = pathlib.Path("/run/ddns/ddnsd.pid")
ADDRESS, PORT = "192.168.40.1", 8080

# serves the bytes of the file named, one answer per connection, and notes each connection in a second file
ANSWERING = """
import socket, sys
server = socket.create_server((sys.argv[1], int(sys.argv[2])))
while True:
    connection, _ = server.accept()
    connection.settimeout(60)
    with open(sys.argv[4], "a") as log:
        log.write("x")
    with connection:
        if connection.recv(4096) and sys.argv[3] == "silent":
            while connection.recv(4096):
                pass
        else:
            connection.sendall(open(sys.argv[3], "rb").read())
"""


@pytest.fixture(autouse=True)
def wire(keep):
    keep(SETTINGS)
    SETTINGS.write_text(f"server={ADDRESS}:{PORT}\n")
    on_other_side("ip", "addr", "replace", f"{ADDRESS}/24", "dev", "eth0")
    run("ip", "addr", "replace", "192.168.40.2/24", "dev", "eth0")
    run("ip", "link", "set", "dev", "eth0", "up")
    yield
    run("/sbin/stop", "ddns")
    RESULT.unlink(missing_ok=True)


class Server(Daemon):
    """Answers with whatever set() was given last."""

    def __init__(self, folder, silent=False):
        self.answer, self.log = folder / "answer", folder / "asked"
        self.set("203.0.113.7\n")
        command = [*OTHER_SIDE, "/usr/bin/python3", "-c", ANSWERING, ADDRESS, PORT,
                   "silent" if silent else self.answer, self.log]  # fmt: skip
        super().__init__(command, self.listens)

    def listens(self):
        return f":{PORT} " in on_other_side("ss", "-Hltn").stdout

    def set(self, body, status="200 OK", headers="Connection: close\r\n"):
        self.answer.write_bytes(f"HTTP/1.1 {status}\r\n{headers}\r\n{body}".encode())

    def asked(self):
        return len(self.log.read_text()) if self.log.exists() else 0


@pytest.fixture
def server(tmp_path):
    with Server(tmp_path) as answering:
        yield answering


def ask(status=0):
    return run(DDNSD, "-e", status=status)


@pytest.mark.parametrize("body", ["203.0.113.7", "203.0.113.7\n", "203.0.113.7\r\n"])
def test_answer_becomes_the_result(server, body):
    server.set(body)
    ask()
    assert RESULT.read_text() == 'externalIP="203.0.113.7"\n'
    assert RESULT.stat().st_mode & 0o777 == 0o644
    assert [entry.name for entry in RESULT.parent.glob("externalIP*")] == [RESULT.name]


@pytest.mark.parametrize(
    "body",
    ["", "none", "203.0.113", "203.0.113.256", "203.0.113.7 ", "2001:db8::1", '203.0.113.7"\nx="', "<b>203.0.113.7</b>",
     "203.0.113.7" + " " * 100, "1.2.3.4\n5.6.7.8\n", "9" * 100_000],
)  # fmt: skip
def test_answer_that_is_no_address_is_no_result(server, body):
    RESULT.parent.mkdir(parents=True, exist_ok=True)
    RESULT.write_text('externalIP="198.51.100.1"\n')
    server.set(body)
    assert "gave no address" in ask(status=1).stderr
    assert not RESULT.exists()


def test_refusing_server_is_no_result(server):
    server.set("203.0.113.7", status="404 Not Found")
    ask(status=1)
    assert not RESULT.exists()


def test_missing_server_is_no_result():
    RESULT.parent.mkdir(parents=True, exist_ok=True)
    RESULT.write_text('externalIP="198.51.100.1"\n')
    ask(status=1)
    assert not RESULT.exists()


def test_silent_server_is_not_waited_for_forever(tmp_path):
    with Server(tmp_path, silent=True):
        began = time.monotonic()
        ask(status=1)
        assert 7 < time.monotonic() - began < 60 * SLOWNESS  # 8 on an idle machine
    assert not RESULT.exists()


@pytest.mark.parametrize(
    "text",
    ["", "server=\n", f"server={ADDRESS}\n", f"server={ADDRESS}:\n", f"server={ADDRESS}:80/x\n", "server=host:80\n",
     f"server=a@{ADDRESS}:80\n", f"server={ADDRESS}:123456\n", f"#server={ADDRESS}:{PORT}\n"],
)  # fmt: skip
def test_unusable_settings_are_reported(server, text):
    SETTINGS.write_text(text)
    assert str(SETTINGS) in ask(status=1).stderr
    assert server.asked() == 0


def test_proxy_of_the_caller_is_not_used(server):
    run(DDNSD, "-e", env={**os.environ, "http_proxy": "http://127.0.0.1:9"})
    assert RESULT.exists()


@pytest.mark.parametrize("words", [[], ["-x"], ["-e", "more"]])
def test_bad_usage(words):
    assert run(DDNSD, *words, status=2).stderr.startswith("usage: ddnsd ")


def test_parallel_questions_leave_one_whole_result(server):
    asking = [subprocess.Popen([DDNSD, "-e"]) for _ in range(8)]
    assert [process.wait(120) for process in asking] == [0] * 8
    assert RESULT.read_text() == 'externalIP="203.0.113.7"\n'


# ---- the daemon and its service ------------------------------------------------------------------------------------


def is_running():
    return run(SERVICE, "status", status=None).returncode == 0


def test_daemon_asks_and_ends(server):
    assert not is_running()
    run("/sbin/start", "ddns")
    wait_for(RESULT.exists, what="the first answer")
    assert is_running()
    assert int(PID_FILE.read_text()) in processes(f"{DDNSD} -d")
    run("/sbin/stop", "ddns")
    assert not processes(f"{DDNSD} -d")
    assert not processes("sleep 300")
    assert not PID_FILE.exists()
    assert not is_running()


def test_reload_makes_the_daemon_ask_again(server, system_log):
    run("/sbin/start", "ddns")
    wait_for(RESULT.exists, what="the first answer")
    pid = PID_FILE.read_text()
    for turn in range(30):  # most come while the daemon is still busy with the one before
        server.set(f"203.0.113.{turn + 50}")
        run(SERVICE, "reload")
        if turn % 5 == 4:
            wait_for(lambda wanted=f'"203.0.113.{turn + 50}"': RESULT.exists() and wanted in RESULT.read_text())
    wait_for(lambda: system_log.holds("reload"), what="the message in the system log")
    assert PID_FILE.read_text() == pid
    wait_for(lambda: len(processes("sleep 300")) == 1, what="the end of all pauses but one")


def test_reload_does_not_wait_for_the_server(tmp_path):
    with Server(tmp_path, silent=True) as server:
        run("/sbin/start", "ddns")
        wait_for(lambda: server.asked() == 1, what="the first question")
        began = time.monotonic()
        run(SERVICE, "reload")
        assert time.monotonic() - began < 6 * SLOWNESS  # the question takes 8, the reload next to nothing
        assert is_running()


def test_reload_without_a_daemon_has_nothing_to_do():
    run(SERVICE, "reload")
    assert not is_running()


def test_pid_file_of_a_dead_daemon_names_nobody(server):
    stranger = subprocess.Popen([sys.executable, "-c", "import time; time.sleep(1000)"])
    PID_FILE.parent.mkdir(parents=True, exist_ok=True)
    for text in (str(stranger.pid), "", "nonsense", "-1", "999999999"):
        PID_FILE.write_text(text + "\n")
        assert not is_running()
        run(SERVICE, "reload")
    assert stranger.poll() is None
    stranger.kill()
    stranger.wait()

    run("/sbin/start", "ddns")
    wait_for(is_running, what="the daemon")


def test_second_daemon_is_refused(server):
    run("/sbin/start", "ddns")
    wait_for(is_running, what="the daemon")
    pid = PID_FILE.read_text()
    assert "runs already" in run(DDNSD, "-d", status=1).stderr
    assert PID_FILE.read_text() == pid


def test_daemon_started_again_after_it_was_killed(server):
    run("/sbin/start", "ddns")
    wait_for(lambda: processes("sleep 300"), what="the daemon's pause")
    os.kill(int(PID_FILE.read_text()), signal.SIGKILL)
    wait_for(lambda: not is_running())
    run("/sbin/start", "ddns")
    wait_for(is_running, what="the daemon")


@pytest.mark.parametrize("words", [[], ["restart"]])
def test_unknown_verb_is_bad_usage(words):
    assert run(SERVICE, *words, status=2).stderr.startswith("usage: ddns ")
