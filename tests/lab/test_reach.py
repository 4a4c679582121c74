# box: --link eth0
"""Whether a host can be reached: kovanet and the library against listeners on the other side of a link, against ports
that refuse and hosts that drop everything, with a time limit of a second."""

import ctypes
import pathlib
import time

import pytest
from conftest import (
    DONE, NO, OTHER_SIDE, SLOWNESS, USAGE, Daemon, complaint, data, documented, kovanet, on_other_side,
    run, wait_for,
)  # fmt: skip
from sdk import library

HERE, OTHER, OTHER6 = "10.9.0.10", "10.9.0.1", "fd09::1"
SILENT, ALSO_SILENT = "10.9.0.11", "10.9.0.66"  # the first is what the resolver puts before OTHER
PORT, CLOSED = 8070, 8071
LIMIT = 1
TICK = 0.01  # a limit is kept in whole milliseconds, of which the first has begun already
PROMPT = 30 * SLOWNESS  # seconds that no answer takes, on however busy a machine
ECHO = """
import pathlib, socket, struct, sys
address, port, heard, cut = sys.argv[1], int(sys.argv[2]), pathlib.Path(sys.argv[3]), sys.argv[4] == "cut"
listener = socket.create_server((address, port), family=socket.AF_INET6 if ":" in address else socket.AF_INET)
while True:
    one = listener.accept()[0]
    if cut:
        one.setsockopt(socket.SOL_SOCKET, socket.SO_LINGER, struct.pack("ii", 1, 0))
    else:
        with heard.open("ab") as file:
            while got := one.recv(64):
                file.write(got.hex().encode() + b" ")
            file.write(b"end\\n")
    one.close()
"""
NETBIOS = """
import socket, sys
answers = socket.socket(socket.AF_INET, socket.SOCK_DGRAM)
answers.bind(("", 137))
while True:
    query, sender = answers.recvfrom(1024)
    name = query[12:46]
    coded = "".join(chr(((name[i] - 65) << 4) + name[i + 1] - 65) for i in range(1, 31, 2)).strip()
    if coded == sys.argv[1].upper():
        reply = query[:2] + bytes.fromhex("8500 0000 0001 0000 0000") + name
        answers.sendto(reply + bytes.fromhex("0020 0001 00000e10 0006 0000") + socket.inet_aton(sys.argv[2]), sender)
"""


def is_listening(port, protocol="tcp"):
    return f":{port} " in on_other_side("ss", "-Hln", f"--{protocol}").stdout


class Host(Daemon):
    """A listener on the other side; heard() is what came, a line for each connection."""

    def __init__(self, folder, address=OTHER, port=PORT, way="read"):
        self.file = folder / f"heard.{port}"
        command = [*OTHER_SIDE, "/usr/bin/python3", "-c", ECHO, address, port, self.file, way]
        super().__init__(command, lambda: is_listening(port))

    def heard(self):
        return self.file.read_text().splitlines() if self.file.exists() else []


@pytest.fixture(scope="module", autouse=True)
def network():
    """Both sides have addresses; frames to the silent hosts go to a station that is not there."""
    on_other_side("ip", "-batch", "-", input=f"addr replace {OTHER}/24 dev eth0\nlink set eth0 up\n"
                                             f"addr replace {OTHER6}/64 dev eth0 nodad\n")  # fmt: skip
    run("ip", "-batch", "-", input=f"addr replace {HERE}/24 broadcast + dev eth0\nlink set eth0 up\n"
                                   f"addr replace fd09::10/64 dev eth0 nodad\n"
                                   f"neigh replace {SILENT} lladdr 02:00:00:00:00:66 dev eth0 nud permanent\n"
                                   f"neigh replace {ALSO_SILENT} lladdr 02:00:00:00:00:67 dev eth0 nud permanent\n")  # fmt: skip
    yield
    run("ip", "-batch", "-", input=f"neigh del {SILENT} dev eth0\nneigh del {ALSO_SILENT} dev eth0\naddr flush dev eth0\n")
    on_other_side("ip", "addr", "flush", "dev", "eth0")


@pytest.fixture(autouse=True)
def names(keep):
    """names(text): the hosts file. Without it, and without another test's name server, no name is known."""
    keep("/etc/hosts").write_text("127.0.0.1 localhost\n")
    keep("/etc/resolv.conf").write_text("nameserver 127.0.0.1\noptions timeout:1 attempts:1\n")  # nobody listens there
    keep("/etc/nsswitch.conf").write_text("hosts: files dns\n")
    keep("/etc/host.conf").write_text("multi on\n")
    return lambda text: pathlib.Path("/etc/hosts").write_text(text)


@pytest.fixture
def no_netbios(keep):
    """The local network is not asked."""
    path = keep("/usr/bin/nmblookup")
    path.unlink(missing_ok=True)


@pytest.fixture
def host(tmp_path):
    with Host(tmp_path) as one:
        yield one


def reach(name, port=PORT, limit=LIMIT):
    """What the library answers, and the seconds it takes."""
    start = time.monotonic()
    answer = library.BlKLIBIsConnected(name.encode(), ctypes.c_int(port), ctypes.c_int(limit))
    return answer, time.monotonic() - start


def test_open_port_answers_at_once_and_gets_one_zero_byte(host):
    answer, seconds = reach(OTHER, limit=60 * SLOWNESS)
    assert answer == 1 and seconds < PROMPT
    wait_for(lambda: host.heard() == ["00 end"], what="the byte")


def test_open_port_of_ipv6_answers(tmp_path):
    with Host(tmp_path, OTHER6) as six:
        assert reach(OTHER6)[0] == 1
        wait_for(lambda: six.heard() == ["00 end"], what="the byte")


def test_closed_port_is_told_without_waiting(no_netbios):
    answer, seconds = reach(OTHER, CLOSED, 60 * SLOWNESS)
    assert answer == 0 and seconds < PROMPT


def test_dropped_packets_are_waited_for_as_long_as_allowed(no_netbios):
    for limit in (1, 3):
        answer, seconds = reach(SILENT, limit=limit)
        assert answer == 0 and limit - TICK < seconds < limit + PROMPT


def test_address_without_a_route_is_told_without_waiting(no_netbios):
    answer, seconds = reach("198.51.100.7", limit=60 * SLOWNESS)
    assert answer == 0 and seconds < PROMPT


def test_each_address_of_a_name_is_tried(host, names, no_netbios):
    names(f"{SILENT} several\n{HERE} several\n{OTHER} several\n")  # dropped, refused, open
    answer, seconds = reach("several", limit=2)
    assert answer == 1 and 2 - TICK < seconds < 2 + PROMPT
    wait_for(lambda: host.heard() == ["00 end"], what="the byte")


def test_each_address_of_a_name_has_the_whole_limit(names, no_netbios):
    names(f"{SILENT} silent\n{ALSO_SILENT} silent\n")
    answer, seconds = reach("silent", limit=2)
    assert answer == 0 and 4 - 2 * TICK < seconds < 4 + PROMPT


def test_name_server_that_never_answers_is_left(no_netbios):
    pathlib.Path("/etc/resolv.conf").write_text(f"nameserver {SILENT}\n")  # with the resolver's own limits
    answer, seconds = reach("nobody.example.net")
    assert answer == 0 and seconds < 60 * SLOWNESS


def test_name_that_only_the_local_network_knows_is_reached(host):
    with Daemon([*OTHER_SIDE, "/usr/bin/python3", "-c", NETBIOS, "nas77", OTHER], lambda: is_listening(137, "udp")):
        assert reach("nas77")[0] == 1
        wait_for(lambda: host.heard() == ["00 end"], what="the byte")
        assert reach("nas78")[0] == 0


def test_listener_that_hangs_up_ends_nobody(tmp_path, no_netbios):
    with Host(tmp_path, port=8072, way="cut"):
        for _ in range(20):
            assert run("/usr/bin/kovanet", "reach", OTHER, 8072, status=None).returncode in (DONE, NO)


# ---- kovanet


def test_kovanet_tells_whether_a_host_answers(host, no_netbios):
    assert kovanet("reach", OTHER, PORT).stdout.startswith(f"{OTHER} port {PORT} answers, after ")
    refused = kovanet("reach", OTHER, CLOSED, status=NO)
    assert refused.stdout.startswith(f"{OTHER} port {CLOSED} does not answer, after ") and refused.stderr == ""
    told = data("reach", OTHER, PORT, "timeout", "3")
    assert list(told) == documented("kovanet reach")
    assert told | {"seconds": 0} == {
        "host": OTHER, "port": PORT, "timeout_seconds": 3, "reachable": True, "seconds": 0,
    }  # fmt: skip
    told = data("reach", SILENT, PORT, "timeout", LIMIT, status=NO)
    assert told["reachable"] is False and told["timeout_seconds"] == LIMIT and told["seconds"] > LIMIT - TICK


def test_kovanet_needs_no_rights(host):
    run("setpriv", "--reuid=65534", "--regid=65534", "--clear-groups", "/usr/bin/kovanet", "reach", OTHER, PORT)


def test_kovanet_explains_what_it_does_not_take():
    for port in ("0", "65536", "-0", "80x", "", "http", " 80", "99999999999999999999"):
        text = complaint("reach", OTHER, "--", port, status=NO)
        assert text == f'port "{port}" is not valid: it is a number from 1 to 65535'
    for timeout in ("0", "3601", "1.5", "x"):
        text = complaint("reach", OTHER, PORT, "timeout", timeout, status=NO)
        assert text == f'timeout "{timeout}" is not valid: it is a number from 1 to 3600'
    assert complaint("reach", "", PORT, status=NO) == 'host "" is not valid: it is a name or an address'
    for words in ((), (OTHER,), (OTHER, PORT, "timeout"), (OTHER, PORT, "within", 3), (OTHER, PORT, "timeout", 3, 4)):
        complaint("reach", *words, status=USAGE)
