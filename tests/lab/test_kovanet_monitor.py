# box: --link eth0 --link lan0
"""kovanet monitor and link watch: change events and link changes as they happen, and the shells' completion."""

import contextlib
import json
import os
import pathlib
import shlex
import shutil
import signal
import subprocess
import time

import pytest
from conftest import (
    CALL_FAILED, DONE, KOVANET, NO_PERMISSION, USAGE, complaint, documented, kovanet, on_other_side, processes, run, wait_for,
)  # fmt: skip

EVENTS = pathlib.Path("/run/kova/events")
PLUGINS = pathlib.Path("/usr/kova/plugins")
EVERY_EVENT = sorted(
    ["service", *(f"net/{name}" for name in (
        "dns_config_change", "dns_change", "mtu_change", "ipv4_change", "ipv6_change", "gateway_config_change",
        "hostname_change", "if_link_up", "if_link_down", "ifname_change"))])  # fmt: skip


@pytest.fixture(autouse=True)
def link_is_up():
    for name in ("eth0", "lan0"):
        run("ip", "link", "set", name, "up")
        on_other_side("ip", "link", "set", name, "up")
    wait_for(lambda: run("ip", "link").stdout.count("state UP") == 2, what="carrier, and that the kernel told of it")
    yield
    on_other_side("ip", "link", "set", "lan0", "up")


def waits_for_changes(pid):
    """Whether a watcher sleeps, having its netlink socket: it does so first when it knows what there is, and misses nothing
    from then on."""
    with contextlib.suppress(FileNotFoundError):  # a file that it just closes
        files = [os.readlink(fd) for fd in pathlib.Path(f"/proc/{pid}/fd").iterdir()]
        state = pathlib.Path(f"/proc/{pid}/stat").read_text().rpartition(")")[2].split()[0]
        return state == "S" and any("socket:" in file for file in files)
    return False


class Watcher:
    """A kovanet that runs until it is told to stop, its lines as they come."""

    def __init__(self, *words):
        self.process = subprocess.Popen([KOVANET, *words], stdout=subprocess.PIPE, stderr=subprocess.PIPE)
        os.set_blocking(self.process.stdout.fileno(), False)
        self.text = b""

    def lines(self):
        self.text += self.process.stdout.read() or b""
        return self.text.decode().splitlines()

    def is_ready(self):
        return waits_for_changes(self.process.pid)

    def end(self, how=signal.SIGTERM):
        self.process.send_signal(how)
        status = self.process.wait(timeout=60)
        assert self.process.stderr.read() == b""
        self.process.stdout.close()
        self.process.stderr.close()
        return status


@contextlib.contextmanager
def watching(*words):
    watcher = Watcher(*words)
    try:
        wait_for(watcher.is_ready, what="the watcher")
        yield watcher
    finally:
        if watcher.process.poll() is None:
            assert watcher.end() == DONE


def events_of(watcher):
    return [json.loads(line) for line in watcher.lines()]


def holds(watcher, event, **arguments):
    return [one for one in events_of(watcher) if one["event"] == event and arguments.items() <= one["arguments"].items()]


def test_every_event_has_the_plug_in():
    assert sorted(str(path.parent.relative_to(PLUGINS)) for path in PLUGINS.rglob("90-note")) == EVERY_EVENT
    assert all(os.access(path, os.X_OK) for path in PLUGINS.rglob("90-note"))


def test_monitor_tells_events_with_their_arguments():
    with watching("monitor", "--json") as watcher:
        kovanet("service", "notify", "ip,mtu", "action", "7")
        wait_for(lambda: len(holds(watcher, "service")) == 2, what="both phases")
        before, after = holds(watcher, "service")
    assert list(before) == documented("kovanet monitor")
    assert (before["phase"], after["phase"]) == ("PRE", "POST") and before["source"] == "event"
    assert before["arguments"] == {"SERVICE_IP_CHANGE": "1", "SERVICE_HOSTNAME_CHANGE": "0", "SERVICE_MTU_CHANGE": "1",
                                   "SERVICE_DAEMON_ACTION": "7", "RESULT": "0"}
    assert abs(before["time"] - time.time()) < 600 and before["time"] <= after["time"]


def test_monitor_tells_link_changes_of_the_kernel():
    with watching("monitor", "--json") as watcher:
        on_other_side("ip", "link", "set", "lan0", "down")
        wait_for(lambda: holds(watcher, "link down", IFNAME="lan0"), what="the end of the link")
        on_other_side("ip", "link", "set", "lan0", "up")
        wait_for(lambda: holds(watcher, "link up", IFNAME="lan0"), what="the link")
        [change] = holds(watcher, "link up", IFNAME="lan0")
        run("ip", "link", "set", "lan0", "down")
        run("ip", "link", "set", "lan0", "name", "lan9")
        wait_for(lambda: holds(watcher, "interface renamed", IFNAME="lan9", ORIGIN_IFNAME="lan0"), what="the new name")
        run("ip", "link", "set", "lan9", "name", "lan0")
    assert change["source"] == "kernel" and change["phase"] is None


def test_monitor_tells_what_went_away_while_too_much_happened():
    with watching("monitor", "--json") as watcher:
        run("ip", "link", "add", "going", "type", "veth", "peer", "name", "gone")
        wait_for(lambda: holds(watcher, "interface added", IFNAME="going"), what="the new interface")
        watcher.process.send_signal(signal.SIGSTOP)
        run("ip", "-batch", "-", input="".join(f"link set eth0 alias {i}\n" for i in range(2000)))
        run("ip", "link", "del", "going")
        watcher.process.send_signal(signal.SIGCONT)
        wait_for(lambda: holds(watcher, "interface removed", IFNAME="going"), what="the removed interface")
        wait_for(lambda: holds(watcher, "interface removed", IFNAME="gone"), what="its other end")
        assert len(holds(watcher, "interface removed")) == 2
        on_other_side("ip", "link", "set", "lan0", "down")
        wait_for(lambda: holds(watcher, "link down", IFNAME="lan0"), what="a change after it")


def test_monitor_tells_that_the_events_cannot_be_read():
    EVENTS.unlink(missing_ok=True)
    EVENTS.mkdir()
    try:
        assert complaint("monitor", "--count", "1", status=CALL_FAILED).startswith(f"cannot read the events in {EVENTS}")
    finally:
        EVENTS.rmdir()


def test_monitor_for_people_has_one_line_a_change():
    with watching("monitor", "--count", "2") as watcher:
        kovanet("service", "notify", "hostname")
        assert watcher.process.wait(timeout=60) == DONE
        lines = [line for line in watcher.lines() if " service " in line]
    assert [line.split(maxsplit=3)[1:3] for line in lines] == [["service", "PRE"], ["service", "POST"]]
    assert "SERVICE_HOSTNAME_CHANGE=1" in lines[0]
    assert "time" not in lines[0]


def test_monitor_needs_no_rights_and_ends_when_told():
    process = subprocess.Popen([KOVANET, "monitor"], stdout=subprocess.PIPE, user=65534)
    wait_for(lambda: waits_for_changes(process.pid), what="the watcher")
    process.send_signal(signal.SIGINT)
    assert process.communicate(timeout=60)[0] == b"" and process.returncode == DONE


def test_monitor_goes_on_when_the_full_file_makes_room():
    kovanet("service", "notify", "ip", "action", "1")
    os.truncate(EVENTS, 2 << 20)
    with watching("monitor", "--json") as watcher:
        kovanet("service", "notify", "ip", "action", "2")
        wait_for(lambda: len(holds(watcher, "service", SERVICE_DAEMON_ACTION="2")) == 2, what="both phases")
    assert EVENTS.stat().st_size < 4096 and EVENTS.with_suffix(".1").stat().st_size == 2 << 20


def test_values_of_events_cannot_pass_for_other_lines_on_a_terminal():
    with watching("monitor") as watcher:
        run("/usr/kova/lib/event-note", input="KEY=a\x1b[31m b=c\n",
            env={"PLUGIN_EVENT": "net/dns_change", "PLUGIN_PHASE": "PRE", "PATH": os.environ["PATH"]})
        wait_for(lambda: any("net/dns_change" in line for line in watcher.lines()), what="the event")
        [line] = [line for line in watcher.lines() if "net/dns_change" in line]
    assert line.endswith(" net/dns_change PRE KEY=a?[31m b=c")


def test_notes_are_of_root_and_for_all_to_read():
    kovanet("service", "notify", "ip")
    assert EVENTS.stat().st_mode & 0o777 == 0o644 and EVENTS.stat().st_uid == 0
    assert EVENTS.parent.stat().st_mode & 0o022 == 0


def test_link_watch_raises_the_librarys_events():
    with watching("link", "watch"), watching("monitor", "--json") as monitor:
        on_other_side("ip", "link", "set", "lan0", "down")
        wait_for(lambda: holds(monitor, "net/if_link_down", IFNAME="lan0"), what="the event of the lost link")
        on_other_side("ip", "link", "set", "lan0", "up")
        wait_for(lambda: holds(monitor, "net/if_link_up", IFNAME="lan0"), what="the event of the link")
        assert {one["phase"] for one in holds(monitor, "net/if_link_up")} == {"POST"}
        assert not holds(monitor, "net/if_link_up", IFNAME="eth0")


def test_link_watch_is_a_job_and_for_root_only():
    run("/sbin/start", "link-watch")
    try:
        wait_for(lambda: processes("kovanet link watch"), what="the watcher")
    finally:
        run("/sbin/stop", "link-watch")
    done = run(KOVANET, "link", "watch", status=NO_PERMISSION, user=65534)
    assert done.stderr == "kovanet: raising events needs root; run it as root or with sudo\n"


# ---- completion -----------------------------------------------------------------------------------------------------


def offered(*words):
    return kovanet("--complete", *words).stdout.splitlines()


def test_completion_offers_objects_verbs_interfaces_choices_and_options():
    assert {"card", "vlan", "show"} <= set(offered("")) and offered("ca") == ["card"]
    assert offered("card", "s") == ["set", "show"]
    assert {"eth0", "lan0", "lo"} <= set(offered("card", "show", ""))
    assert offered("card", "show", "lan") == ["lan0"]
    assert offered("card", "set", "eth0", "") == ["dhcp", "static"]
    assert offered("block", "set", "eth0", "ha", "o") == ["off", "on"]
    assert offered("bond", "create", "bond0", "802") == ["802.3ad"]
    assert offered("bond", "create", "bond0", "802.3ad", "eth0", "lan") == ["lan0"]
    assert offered("dhcp-server", "subnet", "s") == ["set", "show"]
    assert "--json" in offered("card", "list", "--") and "--watch" in offered("stats", "--")
    assert offered("nonsense", "") == [] and offered("card", "show", "eth0", "") == [] and offered("hostname", "set", "") == []


def test_completion_offers_no_name_that_a_shell_would_run():
    run("ip", "link", "add", "$(id)", "type", "veth", "peer", "name", "a;b")
    try:
        assert offered("card", "show", "") == ["eth0", "lan0", "lo"]
    finally:
        run("ip", "link", "del", "a;b")


def test_completion_knows_values_of_options_and_the_relays_interface():
    assert {"eth0", "lan0"} <= set(offered("pppoe-relay", "set", "lbr0", "on", ""))
    assert offered("tunnel", "set", "--password-file", "/root/x", "broker", "") == ["anonymous", "login"]


def bash_offers(line, *words):
    """What bash offers at the end of a line that it parts into words."""
    script = (f"source /usr/share/bash-completion/completions/kovanet; COMP_LINE='{line}'; COMP_POINT={len(line)};"
              f"COMP_WORDS=({' '.join(shlex.quote(word) for word in words)}); COMP_CWORD={len(words) - 1};"
              "_kovanet; printf '%s\\n' \"${COMPREPLY[@]}\"")
    return run("bash", "--norc", "-c", script).stdout.splitlines()


def test_bash_completes(tmp_path):
    script = "source /usr/share/bash-completion/completions/kovanet; complete -p kovanet"
    assert run("bash", "--norc", "-c", script).stdout == "complete -F _kovanet kovanet\n"
    assert bash_offers("kovanet card show la", "kovanet", "card", "show", "la") == ["lan0"]
    assert bash_offers("kovanet ca", "kovanet", "ca") == ["card"]
    split = ("kovanet", "reach", "2001", ":", "db8", "::", "1", "22")
    assert bash_offers("kovanet reach 2001:db8::1 22 ti", *split, "ti") == ["timeout"]
    assert bash_offers("kovanet reach 2001:db8::1 22 ", *split, "") == ["timeout"]
    assert bash_offers("kovanet reach fe80:: ", "kovanet", "reach", "fe80", "::", "") == [""]
    (tmp_path / "secret").touch()
    line = f"kovanet tunnel set broker login alice --password-file {tmp_path}/se"
    assert bash_offers(line, *line.split()) == [f"{tmp_path}/secret"]


@pytest.mark.skipif(shutil.which("zsh") is None, reason="needs zsh")
def test_zsh_completes():
    script = ("compadd() { print -l -- $fitting }; words=(kovanet card show la); CURRENT=4;"
              "source /usr/share/zsh/vendor-completions/_kovanet")
    assert run("zsh", "-f", "-c", script).stdout == "lan0\n"


# ---- versions and mistyped words -------------------------------------------------------------------------------------


def test_version_names_that_of_the_json():
    assert kovanet("--version").stdout == "kovanet 6.0.0, JSON 1\n"


@pytest.mark.parametrize("words,meant", [(["crad"], "card"), (["card", "lst"], "list"), (["verfy"], "verify"),
                                         (["dhcp-server", "subnet", "lits"], "list")])
def test_mistyped_words_are_answered_with_what_may_have_been_meant(words, meant):
    assert complaint(*words, status=USAGE).endswith(f"is not known; did you mean {meant}?")


@pytest.mark.parametrize("words,told", [
    (["help"], 'object "help" is not known; see kovanet --help'),
    (["--verison"], 'option "--verison" is not known; did you mean --version?'),
    (["card", "list", "--jsno"], 'option "--jsno" is not known; did you mean --json?'),
    (["card", "list", "eth0"], '"eth0" is one word too many; see kovanet card list --help'),
    (["card", "set", "eth0", "statc"], '"statc" is none of static, dhcp; did you mean static?'),
    (["card", "set", "eth0", "static", "192.0.2.1", "255.0.0.0"],
     '"255.0.0.0" is not expected here: write mask MASK; see kovanet card set --help'),
    (["reach", "192.0.2.1", "80", "timeout"], "SECONDS is required; see kovanet reach --help"),
])
def test_what_is_not_understood_is_told_in_plain_words(words, told):
    assert complaint(*words, status=USAGE) == told
