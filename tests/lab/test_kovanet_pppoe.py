# box: --link eth0 --link lan0
# needs: bridge ppp pppoe
"""kovanet pppoe and pppoe-relay, compared with the files, the processes and what a real server sees."""

import pathlib
import shutil
import subprocess

import pytest
from conftest import (CALL_FAILED, DONE, KOVANET, NO, NO_PERMISSION, NOT_FOUND, SLOWNESS, USAGE, asked, complaint, data,
                      documented, kill, kovanet, processes, run, wait_for, wait_for_answer)
from pppoe_lab import (CONF, KOVAINFO, PASSWORD, RELAY_SETTINGS, SECRETS, SERVER, USER, PppoeServer, is_enabled,
                       nothing_is_left, relays, write_bridge_files)

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")


@pytest.fixture(autouse=True)
def files(keep):
    for path in (CONF, SECRETS, KOVAINFO):
        keep(path)
    CONF.unlink(missing_ok=True)
    run("ip", "link", "set", "eth0", "up")
    yield
    run("/usr/sbin/pppoe-stop")


@pytest.fixture
def secret(tmp_path):
    path = tmp_path / "secret"
    path.touch(mode=0o600)
    path.write_text(PASSWORD + "\n")
    return path


@pytest.fixture
def bridge(keep):
    """lbr0, a bridge of the local LAN with the port lan0."""
    for name in ("lbr0", "lan0"):
        keep(SCRIPTS / f"ifcfg-{name}")
    write_bridge_files({"lbr0": "lan0"})
    run("/etc/rc.network", "start", "lbr0")
    yield "lbr0"
    run("/sbin/stop", "pppoerelay")
    run("/etc/rc.network", "stop", "lbr0")
    shutil.rmtree(RELAY_SETTINGS, ignore_errors=True)


def stored():
    return CONF.read_text(), SECRETS.read_text()


def shown(*words):
    """The lines of a command as a map."""
    return {title: text.strip() for title, text in (line.split(":", 1) for line in kovanet(*words).stdout.splitlines())}


# ---- settings -------------------------------------------------------------------------------------------------------


def test_settings_are_stored_and_shown(secret):
    assert data("pppoe", "show") == {"interface": None, "user": None, "password_stored": False, "mtu": None,
                                     "default_route": False}  # fmt: skip
    kovanet("pppoe", "set", "eth0", "user", "a'b c", "--password-file", secret)
    assert stored() == ("ETH=eth0\nDEFAULTROUTE=no\nUSER='a'\"'\"'b c'\nMTU=1492\n",
                        f"'a'\"'\"'b c'\t*\t{PASSWORD}\n")  # fmt: skip
    assert SECRETS.stat().st_mode & 0o777 == 0o600

    kovanet("pppoe", "set", "eth0", "default-route", "on", "mtu", "01400", "--keep-password")
    record = {"interface": "eth0", "user": "a'b c", "password_stored": True, "mtu": 1400, "default_route": True}
    assert data("pppoe", "show") == record and list(record) == documented("kovanet pppoe show")
    assert PASSWORD in SECRETS.read_text()
    assert shown("pppoe", "show") == {"interface": "eth0", "user": "a'b c", "password": "stored", "MTU": "1400",
                                      "default route": "yes"}  # fmt: skip


@pytest.mark.parametrize("user", ["[alice]", "[a,b]", "[]", "[[x]]"])
def test_a_user_in_brackets_is_stored_as_it_is_typed(secret, user):
    kovanet("pppoe", "set", "eth0", "user", user, "--password-file", secret)
    assert data("pppoe", "show")["user"] == user


def test_the_switch_is_told_as_the_library_takes_it():
    for value, is_on in (("YES", True), ("yes", True), ("no", False), ("1", False)):
        run("sed", "-i", "/^pppoe_enable=/d", KOVAINFO)
        with KOVAINFO.open("a") as file:
            file.write(f'pppoe_enable="{value}"\n')
        assert data("pppoe", "status")["enabled"] is is_on and data("show")["services"]["pppoe"] is is_on


def test_the_password_comes_from_a_descriptor_or_a_prompt():
    kovanet("pppoe", "set", "eth0", "user", USER, "--password-fd", "0", input=f"{PASSWORD}\n")
    assert SECRETS.read_text() == f"'{USER}'\t*\t{PASSWORD}\n"

    assert asked("pppoe", "set", "eth0", answer=b"typed-word\n", question="Password: ") == (DONE, "Password: \n")
    assert SECRETS.read_text() == f"'{USER}'\t*\ttyped-word\n"


def test_the_password_is_shown_nowhere(secret, system_log):
    kovanet("pppoe", "set", "eth0", "user", USER, "--password-file", secret)
    for words in (["show"], ["show", "--json"], ["status"], ["set", "eth0", "mtu", "1400", "--keep-password"]):
        done = run(KOVANET, "pppoe", *words, "--verbose")
        assert PASSWORD not in done.stdout + done.stderr
    assert PASSWORD not in run("unshare", "--user", KOVANET, "pppoe", "show").stdout
    assert not system_log.holds(PASSWORD)


def test_reading_needs_no_root(secret):
    assert data("pppoe", "status") == {"enabled": False, "running": False, "interface": None, "address": None, "mask": None}
    kovanet("pppoe", "set", "eth0", "user", USER, "--password-file", secret)
    nobody = ("setpriv", "--reuid", "65534", "--regid", "65534", "--clear-groups", KOVANET)
    assert '"password_stored":null' in run(*nobody, "pppoe", "show", "--json").stdout.replace(" ", "")
    assert run(*nobody, "pppoe", "status").stdout == kovanet("pppoe", "status").stdout
    assert run(*nobody, "pppoe-relay", "show", "--json").stdout == "[]\n"


BAD = {
    "pppoe": USAGE, "pppoe shw": "did you mean show?", "pppoe set": USAGE, "pppoe set eth0 usr x": "did you mean user?",
    "pppoe set eth0 user": "user lacks a value", "pppoe set eth0 user a user b": "user is given twice",
    "pppoe set eth0 user a default-route yes": "default-route is on or off",
    "pppoe set eth0 user a --password word": "not given on the command line",
    "pppoe set eth0 user a": "no terminal to ask for the password on",
    "pppoe set nope user a --keep-password": NOT_FOUND, "pppoe set lo user a --keep-password": "is no Ethernet interface",
    "pppoe set eth0 mtu 1400 --keep-password": "no user is stored yet",
    "pppoe set eth0 user a --keep-password": "no password is kept",
    "pppoe set eth0 user a secret": "a word is neither user, mtu nor default-route",
    "pppoe set eth0 user a mtu 127 --keep-password": "128 to 1492",
    "pppoe set eth0 user a mtu 1493 --keep-password": "128 to 1492",
    "pppoe set eth0 user a mtu 14e2 --keep-password": "128 to 1492",
    "pppoe set eth0 user a --password-file /nonexistent": "cannot read the password from /nonexistent",
    "pppoe start": "there are no settings to dial with",

    "pppoe-relay": USAGE, "pppoe-relay set lbr0": USAGE, "pppoe-relay set lbr0 on": "on needs the interface",
    "pppoe-relay set eth0 off lan0": "off takes no server", "pppoe-relay set lbr0 yes eth0": USAGE,
    "pppoe-relay set eth0 on lan0": "no bridge of the local LAN", "pppoe-relay set a/b on lan0": "holds no",
    "pppoe-relay set nope off": NOT_FOUND, "pppoe-relay show nope": NOT_FOUND, "pppoe-relay apply nope": NOT_FOUND,
}  # fmt: skip
BAD_USAGE = ("did you mean", "a word is neither", "user lacks", "user is given", "default-route is", "not given on", "no terminal", "on needs",
             "off takes")  # fmt: skip


def test_bad_input_is_explained_and_changes_nothing():
    before = SECRETS.read_bytes(), KOVAINFO.read_bytes()
    for words, expected in BAD.items():
        is_status = isinstance(expected, int)
        status = expected if is_status else USAGE if expected.startswith(BAD_USAGE) else NO
        text = complaint(*words.split(), status=status)
        assert is_status or expected in text, words
    assert (SECRETS.read_bytes(), KOVAINFO.read_bytes()) == before
    assert not CONF.exists() and not RELAY_SETTINGS.exists()


@pytest.mark.parametrize("user,reason", [("", "not valid"), ("a\nb", "not valid"), ("x" * 256, "too long"),
                                         ("'" * 120, "too long")])  # fmt: skip
def test_users_that_could_not_be_read_back_are_refused(secret, user, reason):
    assert reason in complaint("pppoe", "set", "eth0", "user", user, "--password-file", secret, status=NO)
    assert not CONF.exists()


@pytest.mark.parametrize("password,reason", [("", "there is no password"), (" word", "a blank"), ("word\t", "control"),
                                             ("two\nlines", "one line"), ("x" * 32, "too long")])  # fmt: skip
def test_passwords_that_could_not_be_read_back_are_refused(secret, password, reason):
    secret.write_text(password + "\n")
    text = complaint("pppoe", "set", "eth0", "user", USER, "--password-file", secret, status=NO)
    assert reason in text and (not password or password not in text)
    assert not CONF.exists()


def test_changes_need_root(secret, bridge):
    kovanet("pppoe", "set", "eth0", "user", USER, "--password-file", secret)
    before = stored()
    for words in ("pppoe set eth0 mtu 1400 --keep-password", "pppoe start", "pppoe stop", "pppoe-relay set lbr0 on eth0",
                  "pppoe-relay apply", "pppoe-relay clear"):  # fmt: skip
        assert "needs root" in run("unshare", "--user", KOVANET, *words.split(), status=NO_PERMISSION).stderr
    assert stored() == before and not RELAY_SETTINGS.exists()


# ---- the connection -------------------------------------------------------------------------------------------------


def test_a_connection_is_started_told_about_and_stopped(secret, tmp_path, system_log):
    kovanet("pppoe", "set", "eth0", "user", USER, "mtu", "1400", "--password-file", secret)
    with PppoeServer(tmp_path):
        kovanet("pppoe", "start")
        record = data("pppoe", "status")
        assert record == {"enabled": True, "running": True, "interface": "ppp0", "address": record["address"],
                          "mask": "255.255.255.255"}  # fmt: skip
        assert record["address"].startswith("10.67.0.1") and list(record) == documented("kovanet pppoe status")
        assert shown("pppoe", "status") == {"state": "connected", "interface": "ppp0", "address": record["address"],
                                            "mask": "255.255.255.255"}  # fmt: skip
        wait_for_answer(SERVER)
        ends = "The PPPoE connection over eth0 ends, and is switched off.\n"
        assert ends in asked("vlan", "create", "eth0", "10", "dhcp", answer=b"n\n")[1]
        kovanet("pppoe", "stop")
        assert ends not in asked("vlan", "create", "eth0", "10", "dhcp", answer=b"n\n")[1]
        assert nothing_is_left() and is_enabled() == "no"
        assert shown("pppoe", "status")["state"] == "off"

        secret.write_text("another-word\n")
        kovanet("pppoe", "set", "eth0", "--password-file", secret)
        text = complaint("pppoe", "start", status=CALL_FAILED)
        assert text == "no connection over eth0: the other side refuses user or password"
    assert nothing_is_left() and not system_log.holds(PASSWORD) and not system_log.holds("another-word")


def test_a_client_that_died_is_told(secret, tmp_path):
    kovanet("pppoe", "set", "eth0", "user", USER, "--password-file", secret)
    with PppoeServer(tmp_path):
        kovanet("pppoe", "start")
        kill(processes("/usr/sbin/pppoe-connect"))
        assert shown("pppoe", "status")["state"] == "switched on, but the client does not run"
        kovanet("pppoe", "stop")
        assert nothing_is_left()


def test_a_stop_ends_a_dial_that_gets_no_answer(secret):
    kovanet("pppoe", "set", "eth0", "user", USER, "--password-file", secret)
    with subprocess.Popen([KOVANET, "pppoe", "start"], stderr=subprocess.PIPE, text=True) as dial:
        wait_for(lambda: processes("/usr/sbin/pppd plugin pppoe.so"), what="the dial")
        assert shown("pppoe", "status")["state"] == "dialling"
        kovanet("pppoe", "stop")
        assert "no connection over eth0" in dial.communicate(timeout=60 * SLOWNESS)[1]
    assert dial.returncode == CALL_FAILED
    assert nothing_is_left() and is_enabled() == "no"


# ---- the relay ------------------------------------------------------------------------------------------------------


def test_a_relay_is_set_applied_shown_and_cleared(bridge):
    assert data("pppoe-relay", "show") == []
    assert data("pppoe-relay", "show", bridge) == [{"name": bridge, "enabled": False, "server": None, "running": False}]
    assert not RELAY_SETTINGS.exists(), "reading leaves no file"

    kovanet("pppoe-relay", "set", bridge, "on", "eth0")
    assert (RELAY_SETTINGS / bridge).read_text() == "enable=yes\nserver=eth0\n" and relays() == {}
    kovanet("pppoe-relay", "apply")
    wait_for(lambda: list(relays().values()) == ["-C lbr0 -S eth0"], what="the relay")
    [row] = data("pppoe-relay", "show")
    assert row == {"name": bridge, "enabled": True, "server": "eth0", "running": True}
    assert list(row) == documented("kovanet pppoe-relay show")
    assert [line.split() for line in kovanet("pppoe-relay", "show").stdout.splitlines()] == [
        ["NAME", "RELAY", "SERVER", "RUNS"], ["lbr0", "on", "eth0", "yes"]]

    kovanet("pppoe-relay", "clear")
    assert data("pppoe-relay", "show") == [] and len(relays()) == 1
    kovanet("pppoe-relay", "apply", bridge)
    wait_for(lambda: relays() == {}, what="the relay's end")

    kovanet("pppoe-relay", "set", bridge, "on", "eth0")
    kovanet("pppoe-relay", "set", bridge, "off")
    assert (RELAY_SETTINGS / bridge).read_text() == "enable=no\nserver=eth0\n"


def test_what_cannot_be_relayed_is_told(bridge):
    assert "cannot be on both sides" in complaint("pppoe-relay", "set", bridge, "on", bridge, status=NO)
    kovanet("pppoe-relay", "set", bridge, "on", "eth0")
    run("ip", "link", "set", bridge, "down")
    assert complaint("pppoe-relay", "apply", bridge, status=NO) == "lbr0 is not relayed now: it is not up"
    run("ip", "link", "set", bridge, "up")
    (RELAY_SETTINGS / bridge).write_text("enable=yes\nserver=nope0\n")
    assert "NET_ERR_EXEC" in complaint("pppoe-relay", "apply", bridge, status=CALL_FAILED)
    assert relays() == {}
