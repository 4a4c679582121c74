# box: --no-network
"""The event that has the services follow a change: who gets it, when, and what a plug-in's failure makes of it."""

import concurrent.futures
import os
import pathlib
import signal
import subprocess

import pytest
from conftest import processes, run, wait_for
from sdk import library, register

KOVANET = "/usr/bin/kovanet"
PLUGINS = pathlib.Path("/usr/kova/plugins/service")
RELAY = pathlib.Path("/usr/sbin/pppoe-relay")
DONE, NO, USAGE, _, CALL_FAILED, NO_PERMISSION = range(6)
IP, HOSTNAME, MTU = 1, 2, 4
LOCK, EXEC = 0x400, 0x2A00


def notify(flags, action=0):
    return library.KLIBServicePlugin(action, flags)


def told(phase, ip, hostname, mtu, action=0):
    """A plug-in's standard input."""
    return (
        f"PLUGIN_EVENT=service\nPLUGIN_PHASE={phase}\nSERVICE_IP_CHANGE={ip}\nSERVICE_HOSTNAME_CHANGE={hostname}\n"
        f"SERVICE_MTU_CHANGE={mtu}\nSERVICE_DAEMON_ACTION={action}\nRESULT=0\n"
    )


def kovanet(*words, status=DONE):
    done = run(KOVANET, *words, status=status)
    assert done.stdout == ""
    return done.stderr


@pytest.fixture
def plug_in():
    """plug_in(name, commands): a plug-in of shell commands until the test ends."""
    made = []

    def make(name, commands):
        path = PLUGINS / name
        path.write_text(f"#!/bin/sh\n{commands}\n")
        path.chmod(0o755)
        made.append(path)

    yield make
    for path in made:
        path.unlink()


@pytest.fixture
def notes(tmp_path):
    path = tmp_path / "notes"
    path.touch()
    return path


# ---- the event ------------------------------------------------------------------------------------------------------


@pytest.mark.parametrize("flags", range(8))
@pytest.mark.parametrize("action", [0, 3, -1])
def test_both_phases_reach_a_plugin(plug_in, notes, flags, action):
    plug_in("30-test", f"cat >>{notes}")
    assert notify(flags, action) == 0
    bits = [flags & 1, flags >> 1 & 1, flags >> 2 & 1]
    assert notes.read_text() == told("PRE", *bits, action) + told("POST", *bits, action)


def test_arguments_are_in_the_environment_too(plug_in, notes):
    names = ("PLUGIN_EVENT", "PLUGIN_PHASE", "SERVICE_IP_CHANGE", "SERVICE_HOSTNAME_CHANGE", "SERVICE_MTU_CHANGE",
             "SERVICE_DAEMON_ACTION", "RESULT")  # fmt: skip
    plug_in("30-test", f'echo {" ".join(f"${name}" for name in names)} >>{notes}')
    assert notify(IP | MTU, 7) == 0
    assert notes.read_text() == "service PRE 1 0 1 7 0\nservice POST 1 0 1 7 0\n"


def test_every_plugin_has_one_phase_before_any_has_the_next(plug_in, notes):
    for name in ("80-last", "20-first", "40-second"):
        plug_in(name, f"echo {name} $PLUGIN_PHASE >>{notes}")
    assert notify(IP) == 0
    order = ["20-first", "40-second", "80-last"]
    assert notes.read_text().splitlines() == [f"{name} {phase}" for phase in ("PRE", "POST") for name in order]


@pytest.mark.parametrize("failing", [("PRE",), ("POST",), ("PRE", "POST")])
def test_a_failing_plugin_stops_neither_the_others_nor_the_next_phase(plug_in, notes, system_log, failing):
    plug_in("20-fails", f'case "{" ".join(failing)}" in *"$PLUGIN_PHASE"*) exit 1 ;; esac')
    plug_in("30-test", f"echo $PLUGIN_PHASE >>{notes}")
    assert notify(IP) == 0
    assert notes.read_text().split() == ["PRE", "POST"]
    assert register()[0] == EXEC
    for phase in failing:
        wait_for(lambda text=f"Fail to execute service plugin ({phase})": system_log.holds(text))
    run("logger", "-t", "test", "the end")
    wait_for(lambda: system_log.holds("the end"))
    assert sum("Fail to execute service plugin" in message for message in system_log.messages) == len(failing)


def test_a_plugin_that_hangs_is_given_up(plug_in, notes):
    plug_in("20-hangs", '[ "$PLUGIN_PHASE" = POST ] || exec sleep 1000')
    plug_in("30-test", f"echo $PLUGIN_PHASE >>{notes}")
    assert notify(IP) == 0
    assert notes.read_text().split() == ["PRE", "POST"]
    assert not processes("sleep 1000")


# ---- dispatches beside each other -----------------------------------------------------------------------------------


def test_dispatches_do_not_mix(plug_in, notes):
    plug_in("30-test", f"echo $SERVICE_DAEMON_ACTION $PLUGIN_PHASE >>{notes}; sleep 0.02")
    # two at a time: each waits for one other, and for no more than five seconds
    with concurrent.futures.ThreadPoolExecutor(2) as pool:
        list(pool.map(lambda number: kovanet("service", "notify", "ip", "action", number), range(12)))
    lines = [line.split() for line in notes.read_text().splitlines()]
    assert sorted(int(number) for number, _ in lines) == sorted([*range(12), *range(12)])
    for (first, before), (second, after) in zip(lines[::2], lines[1::2]):
        assert (first, before, after) == (second, "PRE", "POST")


def test_a_dispatch_gives_up_when_another_does_not_end(plug_in, notes, system_log):
    holder = "import ctypes; print(ctypes.CDLL('libkovacore.so.6').KLIBCFileLock(0x1000006, 5), flush=True); input()"
    with subprocess.Popen(["/usr/bin/python3", "-c", holder], stdin=subprocess.PIPE, stdout=subprocess.PIPE,
                          text=True) as other:  # fmt: skip
        assert other.stdout.readline() == "0\n"
        plug_in("30-test", f"echo $PLUGIN_PHASE >>{notes}")
        assert notify(IP) == -1
        assert register() == (LOCK, "named_lock")
        wait_for(lambda: system_log.holds(" Lock failed"))
        assert notes.read_text() == ""
        assert "NET_ERR_LOCK (0x400)" in kovanet("service", "notify", "ip", status=CALL_FAILED)
        other.communicate("\n", timeout=60)
    assert notify(IP) == 0


def test_a_dispatch_that_is_killed_is_not_in_the_way(plug_in, notes, tmp_path):
    held = tmp_path / "held"
    held.touch()
    plug_in("30-test", f"echo $PLUGIN_PHASE >>{notes}; while [ -e {held} ]; do sleep 0.02; done")
    dispatch = subprocess.Popen([KOVANET, "service", "notify", "ip"])
    wait_for(lambda: notes.read_text() == "PRE\n", what="its first phase")
    dispatch.send_signal(signal.SIGKILL)
    dispatch.wait()
    held.unlink()
    assert notify(IP) == 0
    assert notes.read_text().split() == ["PRE", "PRE", "POST"]


def test_the_network_configuration_may_be_changed_meanwhile(plug_in, notes):
    asks = "import ctypes; print(ctypes.CDLL('libkovacore.so.6').KLIBCFileLock(0x106, 0))"
    plug_in("30-test", f'/usr/bin/python3 -c "{asks}" >>{notes}')
    assert notify(IP) == 0
    assert notes.read_text() == "0\n0\n"


# ---- the appliance's own plug-ins -----------------------------------------------------------------------------------


def test_log_has_both_phases(system_log):
    assert notify(IP | HOSTNAME, 5) == 0
    for phase in ("PRE", "POST"):
        text = f"service: {phase}: IP 1, host name 1, MTU 0, action 5"
        wait_for(lambda text=text: system_log.holds(text), what=text)


@pytest.mark.parametrize("flags,reloads", [(IP, 1), (IP | MTU, 1), (HOSTNAME | MTU, 0), (0, 0)])
def test_dynamic_dns_is_reloaded_once_the_address_changed(keep, notes, flags, reloads):
    keep("/usr/kova/service/ddns").write_text(f'#!/bin/sh\necho "$PLUGIN_PHASE $*" >>{notes}\n')
    assert notify(flags) == 0
    assert notes.read_text() == "POST reload\n" * reloads


# ---- what must be down before an address changes --------------------------------------------------------------------


@pytest.fixture
def relay(keep):
    """A program in the relay's place that lives until it is ended; gives the pids of those that run."""
    keep(RELAY).write_text("#!/usr/bin/python3\nimport signal\nsignal.pause()\n")
    RELAY.chmod(0o755)
    yield lambda: processes(f"{RELAY} -C ")
    for pid in processes(f"{RELAY} -C "):
        os.kill(pid, signal.SIGKILL)


@pytest.fixture
def bridge(keep):
    settings = pathlib.Path("/etc/sysconfig/pppoe-relay/br0")
    settings.parent.mkdir(exist_ok=True)
    keep(settings).write_text("enable=yes\nserver=eth0\n")
    run("ip", "link", "add", "br0", "type", "bridge")
    yield "br0"
    run("/sbin/stop", "pppoerelay", status=None)
    run("ip", "link", "del", "br0")


def test_relay_job_is_stopped(relay, bridge):
    run("/sbin/start", "pppoerelay", f"IFACE={bridge}")
    [pid] = wait_for(relay, what="the relay")
    command = pathlib.Path(f"/proc/{pid}/cmdline").read_bytes().decode().split("\0")
    assert command[-6:-1] == ["-C", "br0", "-S", "eth0", "-F"]
    assert library.KLIBServiceStopBeforeIPChange() == 0
    assert relay() == []


def test_relays_that_the_job_did_not_start_are_stopped_too(relay):
    started = [subprocess.Popen([RELAY, "-C", name, "-S", "eth0"]) for name in ("br0", "br1")]
    wait_for(lambda: len(relay()) == 2, what="the relays")
    assert library.KLIBServiceStopBeforeIPChange() == 0
    assert relay() == []
    assert all(process.wait() == -signal.SIGTERM for process in started)


def test_stop_of_one_relay_leaves_the_other(relay, bridge):
    run("/sbin/start", "pppoerelay", f"IFACE={bridge}")
    other = subprocess.Popen([RELAY, "-C", "br01", "-S", "eth0"])
    wait_for(lambda: len(relay()) == 2, what="the relays")
    run("/sbin/stop", "pppoerelay", f"IFACE={bridge}")
    assert relay() == [other.pid]
    other.kill()
    other.wait()


def test_a_relay_that_ignores_the_request_is_killed(relay, tmp_path):
    ready = tmp_path / "ready"
    RELAY.write_text(
        "#!/usr/bin/python3\nimport signal\nsignal.signal(signal.SIGTERM, lambda *_: None)\n"
        f"open('{ready}', 'w').close()\nwhile True:\n    signal.pause()\n"
    )
    process = subprocess.Popen([RELAY, "-C", "br0", "-S", "eth0"])
    wait_for(ready.exists, what="the relay")
    assert library.KLIBServiceStopBeforeIPChange() == 0
    assert process.wait() == -signal.SIGKILL


def test_without_relays_there_is_nothing_to_stop():
    assert library.KLIBServiceStopBeforeIPChange() == 0


def test_a_stop_that_fails_is_told(keep):
    keep("/sbin/stop").write_text("#!/bin/sh\nexit 1\n")
    assert library.KLIBServiceStopBeforeIPChange() == -1
    assert register() == (EXEC, "service")


@pytest.mark.parametrize("settings,complaint", [
    ("enable=no\nserver=eth0\n", "does not say enable=yes"), ("", "does not say enable=yes"),
    ("enable=yes\n", "no usable server"), ("enable=yes\nserver=../x\n", "no usable server"),
])  # fmt: skip
def test_a_relay_that_is_not_to_run_does_not_start(relay, bridge, settings, complaint):
    pathlib.Path(f"/etc/sysconfig/pppoe-relay/{bridge}").write_text(settings)
    assert complaint in run("/sbin/start", "pppoerelay", f"IFACE={bridge}", status=1).stderr
    assert relay() == []


# ---- kovanet --------------------------------------------------------------------------------------------------------


@pytest.mark.parametrize("words,bits,action", [
    (["ip"], (1, 0, 0), 0), (["hostname,mtu"], (0, 1, 1), 0), (["ip,hostname,mtu", "action", "4"], (1, 1, 1), 4),
    (["mtu", "action", "-2", "--json"], (0, 0, 1), -2), (["ip,ip"], (1, 0, 0), 0),
])  # fmt: skip
def test_kovanet_notifies(plug_in, notes, words, bits, action):
    plug_in("30-test", f"cat >>{notes}")
    assert kovanet("service", "notify", *words) == ""
    assert notes.read_text() == told("PRE", *bits, action) + told("POST", *bits, action)


@pytest.mark.parametrize("words", [[], [""], [","], ["IP"], ["ip,other"], ["ip", "mtu"], ["ip", "action"],
                                   ["ip", "do", "1"]])  # fmt: skip
def test_kovanet_refuses_what_it_cannot_understand(plug_in, notes, words):
    plug_in("30-test", f"cat >>{notes}")
    assert kovanet("service", "notify", *words, status=USAGE).endswith("see kovanet service notify --help\n")
    assert notes.read_text() == ""


@pytest.mark.parametrize("action", ["x", "4294967296", "0x1", ""])
def test_kovanet_refuses_an_action_that_is_no_number(plug_in, notes, action):
    plug_in("30-test", f"cat >>{notes}")
    assert f'action "{action}" is not valid' in kovanet("service", "notify", "ip", "action", action, status=NO)
    assert notes.read_text() == ""


def test_kovanet_tells_of_a_plugin_that_failed(plug_in):
    plug_in("20-fails", "exit 1")
    lines = kovanet("service", "notify", "ip", "--verbose", status=CALL_FAILED).splitlines()
    assert [line.rpartition(" ")[2] for line in lines[:2]] == ["(PRE)", "(POST)"]
    assert lines[2].startswith("kovanet: not every service followed: NET_ERR_EXEC (0x2A00)")


def test_kovanet_needs_root(plug_in, notes):
    plug_in("30-test", f"cat >>{notes}")
    assert "needs root" in run("unshare", "--user", KOVANET, "service", "notify", "ip", status=NO_PERMISSION).stderr
    assert notes.read_text() == ""
