# box: --link eth0 --link lan0
"""kovanet as people and scripts run it, compared with what the kernel, the files and iproute2 say."""

import contextlib
import ctypes
import json
import os
import pathlib
import pty
import re
import signal
import subprocess
import time

import pytest
from conftest import (
    CALL_FAILED, CONFIG_EXCLUSIVE, CONFIG_NAME, DONE, KOVANET, NO, NO_PERMISSION, NOT_FOUND, SLOWNESS, USAGE, DhcpServer,
    complaint, data, documented, held_configuration_lock, keys_of, kovanet, on_other_side, processes, run, wait_for,
)  # fmt: skip

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")
NETWORK = pathlib.Path("/etc/sysconfig/network")


def ip(*words):
    return json.loads(run("ip", "-j", *words).stdout)


def link_of(name):
    return ip("link", "show", "dev", name)[0]


def kernel_addresses(name, family="inet"):
    [link] = ip("addr", "show", "dev", name)
    return [f"{one['local']}/{one['prefixlen']}" for one in link["addr_info"] if one["family"] == family]


def interface_file(name):
    return SCRIPTS / f"ifcfg-{name}"


def keys(name):
    return keys_of(interface_file(name))


def everything():
    """The network's state, as far as a refused command could have changed it."""
    files = {path.name: path.read_text() for folder in (SCRIPTS, pathlib.Path("/etc")) for path in folder.iterdir()
             if path.is_file() and path.name.startswith(("ifcfg-", "resolv.conf", "kovainfo.conf"))}
    files["network"] = NETWORK.read_text() if NETWORK.exists() else ""
    shown = [run("ip", *words).stdout for words in (["-o", "addr"], ["-o", "link"], ["route"])]
    return os.uname().nodename, shown, files


@pytest.fixture(autouse=True)
def two_cards():
    """eth0 and lan0 up, static, without an address; the other side of lan0 has 10.9.0.1."""
    on_other_side("ip", "addr", "replace", "10.9.0.1/24", "dev", "lan0")
    for name in ("eth0", "lan0"):
        run("ip", "addr", "flush", "dev", name, "scope", "global")
        run("ip", "link", "set", name, "up")
        interface_file(name).write_text(f"DEVICE={name}\nONBOOT=yes\nBOOTPROTO=static\n")
    wait_for(lambda: all(link_of(name)["operstate"] == "UP" for name in ("eth0", "lan0")), what="carrier")
    yield
    for path in SCRIPTS.glob("ifcfg-*"):
        path.unlink()


@pytest.fixture
def addressed():
    """lan0 with a configured address that it also has."""
    run("ip", "addr", "add", "10.9.0.7/24", "dev", "lan0")
    interface_file("lan0").write_text("DEVICE=lan0\nBOOTPROTO=static\nIPADDR=10.9.0.7\nNETMASK=255.255.255.0\n")


@pytest.fixture
def stopped_clients():
    yield
    for name in ("eth0", "lan0"):
        run("/sbin/stop", "dhcp-client", f"IFACE={name}", status=None)


# ---- card -----------------------------------------------------------------------------------------------------------


def test_card_list_agrees_with_the_kernel(addressed):
    cards = {card["name"]: card for card in data("card", "list")}
    assert cards.keys() == {"eth0", "lan0"}
    for name, card in cards.items():
        link = link_of(name)
        assert (card["mac"], card["mtu"]) == (link["address"], link["mtu"])
        assert (card["up"], card["link"]) == (True, "up")
        speed = pathlib.Path(f"/sys/class/net/{name}/speed").read_text().strip()
        assert str(card["speed_mbps"]) == speed
        assert card["duplex"] == pathlib.Path(f"/sys/class/net/{name}/duplex").read_text().strip()
    lan0, eth0 = cards["lan0"], cards["eth0"]
    assert [f"{lan0['address']}/{lan0['prefix']}"] == kernel_addresses("lan0")
    assert (lan0["mask"], lan0["source"]) == ("255.255.255.0", "static")
    assert (lan0["configured_address"], lan0["configured_mask"]) == ("10.9.0.7", "255.255.255.0")
    assert (eth0["address"], eth0["prefix"], eth0["mask"], eth0["source"]) == (None, None, None, "none")


def test_card_list_leaves_out_what_is_down():
    run("ip", "link", "set", "lan0", "down")
    assert [card["name"] for card in data("card", "list")] == ["eth0"]
    assert data("card", "show", "lan0")["up"] is False


def test_card_list_without_cards_is_an_empty_array():
    run("ip", "link", "set", "lan0", "down")
    run("ip", "link", "set", "eth0", "down")
    assert data("card", "list") == []
    assert kovanet("card", "list").stdout.split() == "NAME LINK SPEED SOURCE ADDRESS MAC MTU".split()


def test_card_list_table_is_aligned(addressed):
    lines = kovanet("card", "list").stdout.splitlines()
    assert lines[0].split() == "NAME LINK SPEED SOURCE ADDRESS MAC MTU".split()
    assert lines[2].split() == ["lan0", "up", "10000", "static", "10.9.0.7/24", link_of("lan0")["address"], "1500"]
    for title, value in (("NAME", "lan0"), ("LINK", "up"), ("SOURCE", "static"), ("ADDRESS", "10.9.0.7/24")):
        assert lines[0].index(title) == lines[2].index(value)
    assert lines[0].index("MTU") + 3 == len(lines[2]) == len(lines[1])


def test_card_show_tells_all_of_one(addressed):
    [expected] = [card for card in data("card", "list") if card["name"] == "lan0"]
    assert data("card", "show", "lan0") == expected
    shown = dict(line.split(":", 1) for line in kovanet("card", "show", "lan0").stdout.splitlines())
    assert shown["address"].strip() == "10.9.0.7/24"
    assert shown["configured"].strip() == "10.9.0.7 mask 255.255.255.0"


@pytest.mark.parametrize("given", [("10.9.0.20/24",), ("10.9.0.20", "mask", "255.255.255.0"), ("10.011.0x0.20/24",)])
def test_card_set_static_changes_kernel_and_file(addressed, given):
    kovanet("card", "set", "lan0", "static", *given)
    address = "10.9.0.20"
    assert kernel_addresses("lan0") == [f"{address}/24"]
    assert keys("lan0") == {"DEVICE": "lan0", "ONBOOT": "yes", "BOOTPROTO": "static", "IPADDR": address,
                            "NETMASK": "255.255.255.0"}
    card = data("card", "show", "lan0")
    assert (card["source"], card["address"], card["configured_address"]) == ("static", address, address)
    assert sorted(path.name for path in SCRIPTS.glob("ifcfg-*")) == ["ifcfg-eth0", "ifcfg-lan0"]


def test_card_set_dhcp_and_back(stopped_clients, tmp_path):
    with DhcpServer("lan0", "10.9.0", folder=tmp_path):
        kovanet("card", "set", "lan0", "dhcp")
        assert keys("lan0")["BOOTPROTO"] == "dhcp"

        def leased():  # the lease is noted before its address is set
            card = data("card", "show", "lan0")
            return card["configured_address"] and card["address"] and card

        card = wait_for(leased, what="the lease")
        assert card["source"] == "dhcp"
        assert re.fullmatch(r"10\.9\.0\.(1[0-9]|20)", card["address"])
        assert (card["configured_address"], card["prefix"]) == (card["address"], 24)
        assert processes("dhclient")
        kovanet("card", "set", "lan0", "static", "10.9.0.30/24")
        wait_for(lambda: not processes("dhclient"), what="the client's end")
    assert kernel_addresses("lan0") == ["10.9.0.30/24"]
    assert data("card", "show", "lan0")["source"] == "static"


# ---- link -----------------------------------------------------------------------------------------------------------


def test_link_show_agrees_with_the_kernel():
    run("ip", "link", "set", "eth0", "down")
    shown = {link["name"]: link for link in data("link", "show")}
    kernel = {link["ifname"]: link for link in ip("link", "show")}
    assert shown.keys() == kernel.keys()
    for name, link in kernel.items():
        assert shown[name]["up"] == ("UP" in link["flags"])
        assert shown[name]["link"] == ("up" if {"UP", "LOWER_UP"} <= set(link["flags"]) else "down")
        assert (shown[name]["mtu"], shown[name]["mac"]) == (link["mtu"], link["address"])
    assert data("link", "show", "eth0") == [shown["eth0"]]
    assert shown["eth0"]["speed_mbps"] is None


def test_link_down_and_up():
    kovanet("link", "down", "lan0")
    assert "UP" not in link_of("lan0")["flags"]
    kovanet("link", "up", "lan0")
    assert "UP" in link_of("lan0")["flags"]


def test_link_rename_and_back():
    kovanet("link", "down", "lan0")
    kovanet("link", "rename", "lan0", "fifteen-letters")
    assert {link["ifname"] for link in ip("link", "show")} == {"lo", "eth0", "fifteen-letters"}
    kovanet("link", "rename", "fifteen-letters", "lan0")
    assert {link["ifname"] for link in ip("link", "show")} == {"lo", "eth0", "lan0"}


def test_link_rename_refuses_an_interface_that_is_up_and_a_name_in_use():
    assert "kovanet link down lan0" in complaint("link", "rename", "lan0", "lan1", status=NO)
    kovanet("link", "down", "lan0")
    assert "named eth0 already" in complaint("link", "rename", "lan0", "eth0", status=NO)
    assert {link["ifname"] for link in ip("link", "show")} == {"lo", "eth0", "lan0"}


# ---- addr -----------------------------------------------------------------------------------------------------------


def test_addr_list_agrees_with_the_kernel(addressed):
    run("ip", "addr", "add", "2001:db8:9::7/64", "dev", "lan0", "nodad")
    listed = {(one["interface"], one["family"], one["address"], one["prefix"], one["scope"])
              for one in data("addr", "list")}
    expected = set()
    for link in ip("addr", "show"):
        for one in link["addr_info"]:
            is_ipv4 = one["family"] == "inet"
            expected.add((link["ifname"], 4 if is_ipv4 else 6, one["local"], one["prefixlen"],
                          None if is_ipv4 else one["scope"]))
    assert ("lan0", 6, "2001:db8:9::7", 64, "global") in expected
    assert listed == expected
    assert {one["interface"] for one in data("addr", "list", "lan0")} == {"lan0"}


def test_addr_list_shows_more_than_sixteen():
    for host in range(1, 21):
        run("ip", "addr", "add", f"2001:db8:9::{host:x}/64", "dev", "lan0", "nodad")
    found = [one["address"] for one in data("addr", "list", "lan0") if one["scope"] == "global"]
    assert sorted(found) == sorted(f"2001:db8:9::{host:x}" for host in range(1, 21))


def test_addr_add_ipv6_keeps_the_others_and_del_removes_one():
    kovanet("addr", "add", "lan0", "2001:db8:9::7/64")
    kovanet("addr", "add", "lan0", "2001:db8:9::8/64")
    assert {"2001:db8:9::7/64", "2001:db8:9::8/64"} <= set(kernel_addresses("lan0", "inet6"))
    kovanet("addr", "del", "lan0", "2001:DB8:9:0::7/64")
    assert "2001:db8:9::7/64" not in kernel_addresses("lan0", "inet6")
    assert "2001:db8:9::8/64" in kernel_addresses("lan0", "inet6")
    assert "has no address" in complaint("addr", "del", "lan0", "2001:db8:9::7/64", status=NOT_FOUND)


def test_addr_add_ipv4_replaces_and_del_removes(addressed):
    kovanet("addr", "add", "lan0", "10.9.0.40/16")
    assert kernel_addresses("lan0") == ["10.9.0.40/16"]
    assert keys("lan0")["IPADDR"] == "10.9.0.7", "only the running address changes"
    assert "has no address" in complaint("addr", "del", "lan0", "10.9.0.7/24", status=NOT_FOUND)
    kovanet("addr", "del", "lan0", "10.9.0.40/16")
    assert kernel_addresses("lan0") == []


def test_addr_flush_removes_one_family(addressed):
    run("ip", "addr", "add", "2001:db8:9::7/64", "dev", "lan0", "nodad")
    interface_file("lan0").write_text(interface_file("lan0").read_text() + "IPV6INIT=auto\n")
    kovanet("addr", "flush", "lan0", "6")
    assert "2001:db8:9::7/64" not in kernel_addresses("lan0", "inet6")
    assert kernel_addresses("lan0") == ["10.9.0.7/24"]
    run("ip", "addr", "add", "2001:db8:9::7/64", "dev", "lan0", "nodad")
    kovanet("addr", "flush", "lan0", "4")
    assert kernel_addresses("lan0") == []
    assert "2001:db8:9::7/64" in kernel_addresses("lan0", "inet6")


@pytest.mark.parametrize("words", [("addr", "add", "lan0", "10.9.0.9/24"), ("card", "set", "lan0", "dhcp"),
                                   ("gateway", "set", "10.9.0.1"), ("gateway", "clear"), ("route", "del", "lan0"),
                                   ("route", "check")])  # fmt: skip
def test_changes_wait_for_the_configuration_lock(words):
    before = everything()
    with held_configuration_lock():
        begin = time.monotonic()
        text = complaint(*words, status=CALL_FAILED)
        assert 4 < time.monotonic() - begin < 60 * SLOWNESS  # 5 on an idle machine
    assert "NET_ERR_LOCK (0x400)" in text and "another program is changing the network; try again" in text
    assert everything() == before


def test_addr_holds_the_configuration_lock_while_it_changes(tmp_path):
    """A plug-in of the change sees whether the lock is free; it runs in the middle of it."""
    plugin = pathlib.Path("/usr/kova/plugins/net/ipv4_change/50-lock")
    plugin.parent.mkdir(parents=True, exist_ok=True)
    answer = tmp_path / "answer"
    plugin.write_text("#!/usr/bin/python3\nimport ctypes\ncore = ctypes.CDLL('libkovacore.so.6')\n"
                      f"open('{answer}', 'a').write(f'{{core.KLIBCFileLock({CONFIG_EXCLUSIVE}, 0)}} ')\n")
    plugin.chmod(0o755)
    try:
        kovanet("addr", "add", "lan0", "10.9.0.9/24")
    finally:
        plugin.unlink()
    assert set(answer.read_text().split()) == {"-1"}
    core = ctypes.CDLL("libkovacore.so.6")
    assert core.KLIBCFileLock(CONFIG_EXCLUSIVE, 0) == 0, "the lock is free afterwards"
    core.KLIBCFileUnlock(CONFIG_NAME)


# ---- stats ----------------------------------------------------------------------------------------------------------


def kernel_counters():
    return {link["ifname"]: {f"{way}_{what}": link["stats64"][way][what] for way in ("rx", "tx")
                             for what in ("bytes", "packets")} for link in ip("-s", "link", "show")}


def test_stats_agree_with_the_kernel(addressed):
    run("ping", "-c", "3", "-i", "0.01", "-q", "10.9.0.1")
    before = kernel_counters()
    shown = data("stats")
    after = kernel_counters()
    assert {one["name"] for one in shown} == before.keys()
    for one in shown:
        for counter in ("rx_bytes", "rx_packets", "tx_bytes", "tx_packets"):
            assert before[one["name"]][counter] <= one[counter] <= after[one["name"]][counter]
    assert next(one for one in shown if one["name"] == "lan0")["rx_packets"] >= 3
    assert [one["name"] for one in data("stats", "lo", "lan0")] == ["lan0", "lo"]


def test_stats_watch_gives_rates_a_line_each(addressed):
    with subprocess.Popen(["ping", "-i", "0.02", "-q", "10.9.0.1"], stdout=subprocess.DEVNULL) as ping:
        before = kernel_counters()["lan0"]["rx_packets"]
        wait_for(lambda: kernel_counters()["lan0"]["rx_packets"] > before + 1, what="traffic")
        begin = time.monotonic()
        lines = kovanet("stats", "lan0", "--watch", "1", "--count", "2", "--json").stdout.splitlines()
        assert 1.9 < time.monotonic() - begin < 60 * SLOWNESS
        ping.terminate()
    first, second = [json.loads(line) for line in lines]
    [old], [new] = first["interfaces"], second["interfaces"]
    for counter in ("rx_bytes", "rx_packets", "tx_bytes", "tx_packets"):
        grown = new[counter] - old[counter]
        assert grown > 0
        assert new[f"{counter}_per_second"] == pytest.approx(grown / second["seconds"], rel=0.02, abs=1)
    assert 0.9 < second["seconds"] < 60
    assert abs(second["time"] - time.time()) < 600


def test_stats_watch_prints_a_table_per_tick():
    printed = kovanet("stats", "--watch", "0.1", "--count", "2").stdout
    assert printed.count("RX BYTES/S") == 2
    assert "\033" not in printed
    assert all(re.fullmatch(r"(NAME .*|(eth0|lan0|lo)( +\d+){4}|)", line) for line in printed.splitlines())


@pytest.mark.parametrize("number", [signal.SIGINT, signal.SIGTERM])
def test_stats_watch_ends_when_interrupted(number):
    with subprocess.Popen([KOVANET, "stats", "--watch", "0.1", "--json"], stdout=subprocess.PIPE, text=True) as watching:
        json.loads(watching.stdout.readline())
        watching.send_signal(number)
        rest, _ = watching.communicate(timeout=60)
        assert watching.returncode == DONE
    assert all(json.loads(line) for line in rest.splitlines())


def test_stats_watch_leaves_out_the_ticks_of_a_pause():
    with subprocess.Popen([KOVANET, "stats", "--watch", "0.2", "--json"], stdout=subprocess.PIPE, text=True) as watching:
        json.loads(watching.stdout.readline())
        watching.send_signal(signal.SIGSTOP)
        time.sleep(2)
        watching.send_signal(signal.SIGCONT)
        ticks = [json.loads(watching.stdout.readline()) for _ in range(6)]
        watching.terminate()
    assert max(tick["seconds"] for tick in ticks) > 1.5
    ticks = ticks[[tick["seconds"] > 1.5 for tick in ticks].index(True):]
    assert sum(tick["seconds"] < 0.005 for tick in ticks) == 0, ticks


def test_stats_watch_outlives_an_interface():
    run("ip", "link", "add", "going", "type", "veth", "peer", "name", "gone")
    with subprocess.Popen([KOVANET, "stats", "--watch", "0.1", "--json"], stdout=subprocess.PIPE, text=True) as watching:
        names = {one["name"] for one in json.loads(watching.stdout.readline())["interfaces"]}
        assert {"going", "gone"} <= names
        run("ip", "link", "del", "going")
        wait_for(lambda: "going" not in watching.stdout.readline(), what="a tick without it")
        run("ip", "link", "add", "going", "type", "veth", "peer", "name", "gone")
        line = wait_for(lambda: text if "going" in (text := watching.stdout.readline()) else None,
                        what="a tick with it again")
        watching.terminate()
    run("ip", "link", "del", "going")
    [new] = [one for one in json.loads(line)["interfaces"] if one["name"] == "going"]
    assert new["rx_bytes_per_second"] is None


# ---- gateway --------------------------------------------------------------------------------------------------------

NO_GATEWAY = {"gateway": None, "interface": None, "configured_gateway": None}


@pytest.fixture
def routers(addressed, keep):
    """Two subnets with a router each: 10.9.0.1 on lan0, 10.8.0.1 on eth0. No gateway yet."""
    keep(NETWORK).write_text("# kept\n")
    run("ip", "addr", "add", "10.8.0.7/24", "dev", "eth0")
    return {"eth0": "10.8.0.1", "lan0": "10.9.0.1"}


@pytest.fixture
def gateway_events(tmp_path):
    """gateway_events(): what a plug-in was told since it was asked last, an event as its phase, its arguments and the
    default gateway at that moment."""
    plugin = pathlib.Path("/usr/kova/plugins/net/gateway_config_change/50-note")
    plugin.parent.mkdir(parents=True, exist_ok=True)
    noted = tmp_path / "noted"
    noted.touch()
    plugin.write_text("#!/bin/sh\n"
                      'echo "$PLUGIN_PHASE $TYPE $INTERFACE [$GATEWAY_OLD] [$GATEWAY_NEW]'
                      f' $(ip route show default | cut -d" " -f3)" >>{noted}\n')
    plugin.chmod(0o755)

    def told():
        lines = noted.read_text().splitlines()
        noted.write_text("")
        return lines

    yield told
    plugin.unlink()


def default_gateway():
    """Gateway and interface of the default route as iproute2 has them."""
    found = ip("route", "show", "default")
    return (found[0]["gateway"], found[0]["dev"]) if found else (None, None)


def test_gateway_set_and_clear_change_kernel_and_file(routers, gateway_events):
    assert data("gateway", "show") == NO_GATEWAY
    before = ""
    for name, router in routers.items():
        kovanet("gateway", "set", router)
        assert default_gateway() == (router, name)
        assert NETWORK.read_text() == f"# kept\nGATEWAY={router}\n"
        assert data("gateway", "show") == {"gateway": router, "interface": name, "configured_gateway": router}
        assert gateway_events() == [f"PRE ipv4 {name} [{before}] [{router}] {before}",
                                    f"POST ipv4 {name} [{before}] [{router}] {router}"]
        before = router
    kovanet("gateway", "clear")
    assert default_gateway() == (None, None) and NETWORK.read_text() == "# kept\n"
    assert data("gateway", "show") == NO_GATEWAY
    assert gateway_events() == ["PRE ipv4 lan0 [10.9.0.1] [] 10.9.0.1", "POST ipv4 lan0 [10.9.0.1] [] "]
    kovanet("gateway", "clear")


def test_gateway_show_tells_both_gateways_where_they_differ(routers):
    run("ip", "route", "add", "default", "via", routers["lan0"], "metric", "7")
    NETWORK.write_text('GATEWAY="router"\n')
    assert data("gateway", "show") == {"gateway": "10.9.0.1", "interface": "lan0", "configured_gateway": "router"}
    assert kovanet("gateway", "show").stdout == "gateway:    10.9.0.1\ninterface:  lan0\nconfigured: router\n"


def test_gateway_show_shows_no_control_characters_and_the_beginning_of_a_long_text(routers):
    NETWORK.write_text("GATEWAY=\x1b[31m\n")
    assert "configured: ?[31m\n" in kovanet("gateway", "show").stdout
    NETWORK.write_text(f"GATEWAY={'x' * 4096}\n")
    assert data("gateway", "show")["configured_gateway"] == "x" * 255
    NETWORK.write_bytes(b"GATEWAY=\xff\n")
    assert data("gateway", "show")["configured_gateway"] == "\ufffd"


def test_gateway_takes_a_missing_file_as_an_empty_one(routers):
    NETWORK.unlink()
    assert data("gateway", "show") == NO_GATEWAY
    kovanet("gateway", "clear")
    assert not NETWORK.exists()
    kovanet("gateway", "set", "10.8.0.1")
    assert NETWORK.read_text() == "GATEWAY=10.8.0.1\n"


def test_gateway_accepts_every_writing_of_an_address(routers):
    for given, meant in (("10.010.0x0.1", "10.8.0.1"), ("012.9.0.1", "10.9.0.1")):
        kovanet("gateway", "set", given)
        assert default_gateway()[0] == keys_of(NETWORK)["GATEWAY"] == meant


@pytest.mark.parametrize("address,reason", [
    ("10.9.0.7", "it is the address of lan0"), ("10.8.0.7", "it is the address of eth0"),
    ("10.9.0.255", "the address is the broadcast address of its network"),
    ("10.7.0.1", "no interface that is up has an address in its subnet; see kovanet addr list"),
])  # fmt: skip
def test_gateway_that_can_be_no_router_is_refused_with_the_reason(routers, gateway_events, address, reason):
    kovanet("gateway", "set", "10.9.0.1")
    gateway_events()
    assert complaint("gateway", "set", address, status=NO) == f'gateway "{address}" is not valid: {reason}'
    assert default_gateway() == ("10.9.0.1", "lan0") and NETWORK.read_text() == "# kept\nGATEWAY=10.9.0.1\n"
    assert gateway_events() == []


def test_gateway_of_an_interface_that_is_down_is_refused(routers):
    run("ip", "link", "set", "eth0", "down")
    assert "no interface that is up" in complaint("gateway", "set", "10.8.0.1", status=NO)


@pytest.mark.parametrize("words", ["gateway show", "gateway set 10.8.0.1", "gateway clear"])
def test_gateway_file_that_cannot_be_read_is_a_failure_that_changes_nothing(routers, gateway_events, words):
    run("ip", "route", "add", "default", "via", "10.9.0.1")
    NETWORK.unlink()
    NETWORK.mkdir()
    try:
        assert "NET_ERR_FILE_OPEN (0x900)" in complaint(*words.split(), status=CALL_FAILED)
    finally:
        NETWORK.rmdir()
    assert default_gateway() == ("10.9.0.1", "lan0") and gateway_events() == []


def test_gateway_that_the_kernel_refuses_leaves_the_old_one(routers, gateway_events):
    kovanet("gateway", "set", "10.9.0.1")
    gateway_events()
    run("ip", "route", "del", "10.8.0.0/24", "dev", "eth0")
    text = complaint("gateway", "set", "10.8.0.1", status=CALL_FAILED)
    assert text.startswith("cannot set the default gateway to 10.8.0.1: NET_ERR_EXEC (0x2A00) in net_default_gateway_set; ")
    assert default_gateway() == ("10.9.0.1", "lan0") and NETWORK.read_text() == "# kept\nGATEWAY=10.9.0.1\n"
    assert gateway_events() == ["PRE ipv4 eth0 [10.9.0.1] [10.8.0.1] 10.9.0.1",
                                "POST ipv4 eth0 [10.9.0.1] [10.9.0.1] 10.9.0.1"]


@pytest.mark.parametrize("words", ["gateway set 10.8.0.1", "gateway clear"])
@pytest.mark.parametrize("before", ["10.9.0.1", None])
def test_gateway_file_that_cannot_be_written_leaves_the_old_one(routers, gateway_events, words, before):
    if before:
        kovanet("gateway", "set", before)
    else:
        NETWORK.write_text("GATEWAY=10.9.0.1\n")
    gateway_events()
    text = NETWORK.read_text()
    run("mount", "--bind", NETWORK.parent, NETWORK.parent)
    try:
        run("mount", "-o", "remount,bind,ro", NETWORK.parent)
        told = complaint(*words.split(), status=CALL_FAILED)
    finally:
        run("umount", NETWORK.parent)
    what = "remove the configured gateway from" if "clear" in words else "store the default gateway in"
    assert f"cannot {what} /etc/sysconfig/network: " in told
    assert default_gateway()[0] == before and NETWORK.read_text() == text
    assert [event.split(" ")[3:5] for event in gateway_events()] == [
        ["[10.9.0.1]", "[10.8.0.1]" if "set" in words else "[]"], ["[10.9.0.1]", "[10.9.0.1]"]]


def test_gateway_changes_whatever_a_plug_in_makes_of_it(routers, gateway_events):
    plugin = pathlib.Path("/usr/kova/plugins/net/gateway_config_change/10-fails")
    plugin.write_text("#!/bin/sh\nexit 1\n")
    plugin.chmod(0o755)
    try:
        kovanet("gateway", "set", "10.9.0.1")
    finally:
        plugin.unlink()
    assert default_gateway() == ("10.9.0.1", "lan0") and len(gateway_events()) == 2


# ---- route ----------------------------------------------------------------------------------------------------------


def route_devices(subnet):
    """The interfaces that a subnet's routes lead over, the used one first."""
    return [route["dev"] for route in ip("route", "show", subnet)]


@pytest.fixture
def one_subnet(addressed):
    """eth0 in lan0's subnet."""
    run("ip", "addr", "add", "10.9.0.8/24", "dev", "eth0")
    interface_file("eth0").write_text("DEVICE=eth0\nBOOTPROTO=static\nIPADDR=10.9.0.8\nNETMASK=255.255.255.0\n")
    assert route_devices("10.9.0.0/24") == ["lan0", "eth0"]


def test_route_del_and_add(one_subnet):
    kovanet("route", "del", "eth0")
    assert route_devices("10.9.0.0/24") == ["lan0"]
    kovanet("route", "add", "eth0")
    assert route_devices("10.9.0.0/24") == ["eth0", "lan0"]
    kovanet("route", "del", "lan0")
    kovanet("route", "del", "lan0")
    assert route_devices("10.9.0.0/24") == ["eth0"]


def test_route_of_another_address(addressed):
    run("ip", "addr", "add", "10.7.5.6/16", "dev", "lan0", "noprefixroute")
    kovanet("route", "add", "lan0", "10.7.5.6/16")
    [route] = ip("route", "show", "10.7.0.0/16")
    assert (route["dev"], route["prefsrc"]) == ("lan0", "10.7.5.6")
    kovanet("route", "del", "lan0", "10.7.05.0x6/16")
    assert ip("route", "show", "10.7.0.0/16") == []
    assert route_devices("10.9.0.0/24") == ["lan0"], "that of the configured address stays"


def test_route_check_clears_the_interface_without_link(one_subnet):
    on_other_side("ip", "link", "set", "lan0", "down")
    try:
        wait_for(lambda: link_of("lan0")["operstate"] != "UP", what="the loss of carrier")
        kovanet("route", "check")
        assert route_devices("10.9.0.0/24") == ["eth0"]
    finally:
        on_other_side("ip", "link", "set", "lan0", "up")


def test_route_tells_why_there_is_none(addressed):
    run("ip", "link", "set", "eth0", "down")
    assert complaint("route", "add", "eth0", status=NO) == (
        "eth0 is down and can have no route; first: kovanet link up eth0")
    assert "eth0 is down" in complaint("route", "add", "eth0", "10.6.0.1/24", status=NO)
    assert complaint("route", "add", "lo", status=NO).startswith("lo has no route of its own: ")
    interface_file("lan0").write_text("BOOTPROTO=dhcp\n")
    assert complaint("route", "add", "lan0", status=NO) == "lan0 uses DHCP: its client sets the route"
    lacks_address = "lan0 has no address in its file or lease; say which: kovanet route {} lan0 ADDRESS/LENGTH"
    assert complaint("route", "del", "lan0", status=NO) == lacks_address.format("del")
    interface_file("lan0").write_text("BOOTPROTO=static\n")
    for verb in ("add", "del"):
        assert complaint("route", verb, "lan0", status=NO) == lacks_address.format(verb)
    assert route_devices("10.9.0.0/24") == ["lan0"]
    run("ip", "link", "set", "lan0", "down")
    assert complaint("route", "check", status=CALL_FAILED).startswith("cannot delete the routes of the interfaces ")


def test_route_shows_what_the_tools_refuse_with_verbose(one_subnet):
    kovanet("route", "del", "eth0")
    told = run(KOVANET, "route", "add", "eth0", "--verbose").stderr
    assert re.search(r"kovanet\[\d+\]: net_routetable_edit:\d+ eth0 ip route add failed, might be the same subnet, "
                     r"instead of route\n", told)


# ---- block ----------------------------------------------------------------------------------------------------------


def test_block_set_and_show():
    assert data("block", "show", "lan0") == {"name": "lan0", "blocked": False, "ha": False, "aha": False,
                                             "virtual": False, "orlena": False}
    for reason, key in (("ha", "BLOCK_HA"), ("aha", "BLOCK_AHA"), ("virtual", "BLOCK_VIRTUAL"),
                        ("orlena", "BLOCK_ORLENA")):
        kovanet("block", "set", "lan0", reason, "on")
        assert keys("lan0")[key].strip('"') == "yes"
        shown = data("block", "show", "lan0")
        assert shown["blocked"] and [name for name in shown if shown[name] is True and name != "blocked"] == [reason]
        kovanet("block", "set", "lan0", reason, "off")
        assert keys("lan0")[key].strip('"') == "no"
    assert keys("lan0")["BLOCK_CNT"].strip('"') == "0"
    assert data("block", "show", "lan0")["blocked"] is False


def test_block_needs_the_interface_file():
    interface_file("lan0").unlink()
    for words in (("block", "show", "lan0"), ("block", "set", "lan0", "ha", "on")):
        assert "NET_ERR_FILE_OPEN (0x900)" in complaint(*words, status=CALL_FAILED)


# ---- check ----------------------------------------------------------------------------------------------------------

VALID = [
    "address 10.0.0.1", "address 223.255.255.255", "address 012.1.1.1", "mask 255.255.255.0", "mask 0xff.255.255.0",
    "mask 255.255.255.255", "address 192.168.1.0 mask 255.255.255.0", "address 192.168.1.1 mask 255.255.255.255",
    "prefix 192.168.1.77/24", "prefix 10.0.0.0/32", "ipv6 fe80::1/64", "ipv6 ::1", "ipv6 2001:db8::/0",
    "hostname nas01", "hostname abcdefghijklmno", "hostname _x-1", "domain example", "domain a.b.c",
]  # fmt: skip

INVALID = {
    "address 127.0.0.1": "loopback", "address 0.1.2.3": "begin with 0", "address 224.0.0.1": "at most 223",
    "address 1.2.3": "four numbers", "address 1.2.3.4.5": "four numbers", "address 1.2.3.256": "at most 255",
    "address text": "four numbers", "address 10.0.0.1/24": "four numbers", "mask 0.0.0.0": "at least one bit",
    "mask 255.0.255.0": "without a gap", "mask 255.255.256.0": "at most 255", "mask 255.255": "four numbers",
    "address 192.168.1.255 mask 255.255.255.0": "broadcast", "address 127.0.0.1 mask 255.0.0.0": "loopback",
    "address 10.0.0.1 mask 255.0.255.0": "without a gap", "prefix 192.168.1.0/0": "1 to 32",
    "prefix 192.168.1.0/33": "1 to 32", "prefix 192.168.1.0/24x": "1 to 32", "prefix 192.168.1.0": "a length",
    "prefix 192.168.1/24": "four numbers", "prefix 192.168.1.300/24": "at most 255", "ipv6 fe80::1/": "0 to 128",
    "ipv6 fe80::1/129": "0 to 128", "ipv6 fe80:::1": "hexadecimal", "ipv6 10.0.0.1": "hexadecimal",
    "hostname 1nas": "begins with", "hostname abcdefghijklmnop": "15 characters", "hostname a.b": "only letters",
    "domain a..b": "empty", "domain .a": "empty", "domain a.": "empty", "domain a@b": "no blanks",
}  # fmt: skip


@pytest.mark.parametrize("words", VALID)
def test_check_accepts(words):
    answer = data("check", *words.split())
    assert (answer["valid"], answer["reason"], answer["kind"], answer["value"]) == (True, None, *words.split()[:2])
    assert " is valid" in kovanet("check", *words.split()).stdout


@pytest.mark.parametrize("words,reason", INVALID.items())
def test_check_refuses_with_the_rule(words, reason):
    answer = data("check", *words.split(), status=NO)
    assert answer["valid"] is False and reason in answer["reason"]
    plain = kovanet("check", *words.split(), status=NO)
    assert plain.stdout.endswith(f"is not valid: {answer['reason']}\n") and plain.stderr == ""


@pytest.mark.parametrize("kind", ["address", "mask", "prefix", "ipv6", "hostname", "domain"])
@pytest.mark.parametrize("value", [" ", "x" * 5000, "\x1b[31m", "1" * 40 + ".1.1.1", "..."])
def test_check_refuses_odd_texts_cleanly(kind, value):
    refused = kind != "domain" or value[0] not in "x1"  # labels of a domain may be long and begin with a digit
    printed = kovanet("check", kind, "--", value, status=NO if refused else DONE)
    assert printed.stderr == "" and "\x1b" not in printed.stdout


@pytest.mark.parametrize("kind", ["address", "mask", "prefix", "ipv6", "hostname", "domain"])
def test_check_refuses_an_empty_text(kind):
    assert kovanet("check", kind, "", status=NO).stdout.startswith('"" is not valid: ')


def test_check_prefix_tells_its_network():
    answer = data("check", "prefix", "192.168.1.77/24")
    assert (answer["network"], answer["mask"]) == ("192.168.1.0", "255.255.255.0")


# ---- bad input ------------------------------------------------------------------------------------------------------

BAD = {
    # what cannot be understood
    "": USAGE, "card": USAGE, "card lst": USAGE, "crad list": USAGE, "card list more": USAGE, "card show": USAGE,
    "card set": USAGE, "card set lan0": USAGE, "card set lan0 static": USAGE, "card set lan0 static 10.9.0.9": USAGE,
    "card set lan0 static 10.9.0.9 mask": USAGE, "card set lan0 static 10.9.0.9/24 mask 255.255.255.0": USAGE,
    "card set lan0 static 10.9.0.9 netmask 255.255.255.0": USAGE, "card set lan0 bootp": USAGE,
    "card set lan0 dhcp 10.9.0.9/24": USAGE, "link up": USAGE, "link rename lan0": USAGE, "addr add lan0": USAGE,
    "addr flush lan0": USAGE, "addr flush lan0 5": USAGE, "stats --count 2": USAGE,
    "gateway": USAGE, "gateway set": USAGE, "gateway set 10.9.0.1 lan0": USAGE, "gateway show lan0": USAGE,
    "gateway clear 10.9.0.1": USAGE, "gateway del": USAGE, "route": USAGE, "route add": USAGE, "route del": USAGE,
    "route check lan0": USAGE, "route add lan0 10.9.0.7/24 more": USAGE, "route add lan0 --dev": USAGE,
    "dns": USAGE, "dns set": USAGE, "dns mode": USAGE, "dns mode Static": USAGE, "dns mode static auto": USAGE,
    "dns show more": USAGE, "dns update now": USAGE,
    "block set lan0 ha": USAGE, "block set lan0 ha yes": USAGE, "block set lan0 other on": USAGE, "check": USAGE,
    "hostname": USAGE, "hostname set": USAGE, "hostname show more": USAGE, "hostname set a b": USAGE,
    "service": USAGE, "service notify": USAGE, "service notify other": USAGE, "service notify ip action": USAGE,
    "check address": USAGE, "check address 10.0.0.1 mask": USAGE, "card list --bogus": USAGE, "--bogus": USAGE,
    # values that are not acceptable
    "card set lan0 static 10.9.0.256/24": NO, "card set lan0 static 127.0.0.1/8": NO,
    "card set lan0 static 10.9.0.255/24": NO, "card set lan0 static 10.9.0.9/33": NO,
    "card set lan0 static 10.9.0.9/0": NO, "card set lan0 static 10.9.0.9/": NO,
    "card set lan0 static 10.9.0.9 mask 255.0.255.0": NO, "card set lan0 static fe80::1/64": NO,
    "card set ../lan0 static 10.9.0.9/24": NO, "card set .. dhcp": NO, "card set seventeen-letters dhcp": NO,
    "card show a/b": NO, "link show seventeen-letters": NO, "link rename lan0 a/b": NO,
    "link rename lan0 seventeen-letters": NO, "link up a/b": NO, "addr add lan0 10.9.0.9": NO,
    "addr add lan0 10.9.0.9/33": NO, "addr add lan0 10.9.0.9/0": NO, "addr add lan0 300.1.1.1/24": NO,
    "addr add lan0 fe80::1": NO, "addr add lan0 fe80::1/129": NO, "addr add lan0 fe80:::1/64": NO,
    "addr del lan0 10.9.0.9": NO, "addr list a/b": NO, "stats a/b": NO, "block show a/b": NO,
    "hostname set a/b": NO, "hostname set .a": NO, "dns set 1.2.3": NO,
    "dns set 10.9.0.1 1.2.3": NO, "dns set 10.9.0.1 host": NO, "dns set fe80::1%lan0": NO,
    "stats --watch 0": NO, "stats --watch --count 0": NO, "stats --watch --count -1": NO, "stats --watch eth0": NO,
    "stats --watch 0x1": NO, "stats --watch --count 0x1": NO, "stats --watch inf": NO, "monitor --count 0x1": NO,
    "ports list tcp 0x10": NO, "ports used tcp 0x10": NO, "service notify ip action 0x1": NO, "dns set [10.9.0.1]": NO,
    "block set ../lan0 ha on": NO, "gateway set router": NO, "gateway set 10.9.0.256": NO, "gateway set 10.9.0.1/24": NO,
    "gateway set fe80::1": NO, "gateway set 127.0.0.1": NO, "gateway set 172.16.0.1": NO, "gateway set 0.0.0.0": NO,
    "gateway set -- -h": NO, f"gateway set {'x' * 4096}": NO, "route add ../lan0": NO, "route del seventeen-letters": NO,
    f"route add {'n' * 63}": NO, f"route del {'n' * 64}": NO, f"route add {'n' * 4096}": NO, "route add lo": NO,
    "route add lan0 10.9.0.7": NO, "route add lan0 10.9.0.7/33": NO, "route del lan0 10.9.0.7/0": NO,
    "route del lan0 fe80::1/64": NO, "route add lan0 10.9.0.300/24": NO,
    # what is not there
    "card show nope": NOT_FOUND, "card show lo": NOT_FOUND, "card set nope dhcp": NOT_FOUND,
    "card set nope static 10.9.0.9/24": NOT_FOUND, "card set lo dhcp": NOT_FOUND, "link show nope": NOT_FOUND,
    "link up nope": NOT_FOUND, "link down nope": NOT_FOUND, "link rename nope lan1": NOT_FOUND,
    "addr list nope": NOT_FOUND, "addr add nope 10.9.0.9/24": NOT_FOUND, "addr del nope 10.9.0.9/24": NOT_FOUND,
    "addr del lan0 10.9.0.9/24": NOT_FOUND, "addr del lan0 2001:db8::9/64": NOT_FOUND,
    "addr flush nope 4": NOT_FOUND, "stats nope": NOT_FOUND, "stats eth0 nope --watch": NOT_FOUND,
    "route add nope": NOT_FOUND, "route del nope": NOT_FOUND, "route del nope 10.9.0.7/24": NOT_FOUND,
    "block show nope": NOT_FOUND, "block set nope ha on": NOT_FOUND,
}  # fmt: skip


@pytest.mark.parametrize("words,status", BAD.items(), ids=[words[:40] for words in BAD])
def test_bad_input_has_its_exit_code_and_changes_nothing(words, status):
    before = everything()
    text = complaint(*words.split(), status=status)
    assert everything() == before
    if status == USAGE:
        assert " --help" in text or "did you mean" in text or "give the address" in text or "takes no address" in text


@pytest.mark.parametrize("words", ["card show", "link show", "addr list", "stats", "block show"])
def test_an_empty_interface_name_is_refused(words):
    assert "1 to 15 characters" in complaint(*words.split(), "", status=NO)


def test_a_mistyped_word_gets_a_suggestion():
    assert "did you mean card?" in complaint("crad", "list", status=USAGE)
    assert "did you mean list?" in complaint("card", "lits", status=USAGE)
    assert "did you mean" not in complaint("elephant", status=USAGE)


# ---- the rest -------------------------------------------------------------------------------------------------------


@pytest.mark.parametrize("words", ["card set lan0 dhcp", "card set lan0 static 10.9.0.9/24", "link up lan0",
                                   "link down lan0", "link rename lan0 lan1", "addr add lan0 10.9.0.9/24",
                                   "addr del lan0 10.9.0.9/24", "addr flush lan0 4", "block set lan0 ha on",
                                   "gateway set 10.9.0.1", "gateway clear", "route check", "route add lan0",
                                   "route del lan0", "dns set 10.9.0.1", "dns mode auto", "dns update",
                                   "hostname set other", "service notify ip"])  # fmt: skip
def test_changes_need_root(words):
    before = everything()
    done = run("unshare", "--user", KOVANET, *words.split(), status=NO_PERMISSION)
    assert done.stdout == "" and done.stderr == "kovanet: changing the network needs root; run it as root or with sudo\n"
    assert everything() == before


def test_reading_needs_no_root(addressed):
    for words in (["card", "list", "--json"], ["link", "show", "--json"], ["addr", "list", "--json"],
                  ["gateway", "show", "--json"], ["dns", "show", "--json"], ["hostname", "show", "--json"]):
        assert run("unshare", "--user", KOVANET, *words).stdout == kovanet(*words).stdout


@pytest.mark.parametrize("command,section", [
    ("card list", "kovanet card list"), ("card show lan0", "kovanet card list"), ("link show", "kovanet link show"),
    ("addr list", "kovanet addr list"), ("stats", "kovanet stats"), ("block show lan0", "kovanet block show"),
    ("gateway show", "kovanet gateway show"),
    ("dns show", "kovanet dns show"), ("hostname show", "kovanet hostname show"),
    ("check hostname nas01", "kovanet check"),
])  # fmt: skip
def test_json_has_exactly_the_documented_fields(addressed, command, section):
    printed = data(*command.split())
    rows = printed if isinstance(printed, list) else [printed]
    assert rows
    for row in rows:
        assert list(row) == documented(section)


def test_json_of_a_watch_has_exactly_the_documented_fields():
    tick = data("stats", "--watch", "0.1", "--count", "1")
    assert list(tick) == documented("kovanet stats --watch")
    for row in tick["interfaces"]:
        assert list(row) == documented("kovanet stats") + documented("kovanet stats --watch, each interface")


def test_json_may_stand_anywhere():
    assert run(KOVANET, "--json", "card", "list").stdout == run(KOVANET, "card", "--json", "list").stdout


def on_terminal(*words, environment=None):
    """What a command prints on a terminal."""
    master, slave = pty.openpty()
    settings = {key: value for key, value in os.environ.items() if key != "NO_COLOR"} | {"TERM": "xterm"}
    with subprocess.Popen([KOVANET, *words], stdout=slave, env=settings | (environment or {})) as process:
        os.close(slave)
        printed = b""
        with contextlib.suppress(OSError):  # the terminal is gone when the command is
            while chunk := os.read(master, 4096):
                printed += chunk
        os.close(master)
    assert process.returncode == DONE
    return printed.decode().replace("\r\n", "\n")


def test_colour_only_on_a_terminal_that_wants_it():
    assert "\033[32mup\033[0m" in on_terminal("link", "show")
    assert "\033" not in on_terminal("link", "show", environment={"NO_COLOR": "1"})
    assert "\033" not in on_terminal("link", "show", environment={"TERM": "dumb"})
    assert "\033" not in kovanet("link", "show").stdout
    assert re.sub(r"\033\[\d+m", "", on_terminal("link", "show")) == kovanet("link", "show").stdout


def test_watch_redraws_on_a_terminal():
    printed = on_terminal("stats", "--watch", "0.1", "--count", "2")
    assert printed.count("\033[4A\033[J") == 1, "the header and three interfaces are drawn over"


def test_verbose_shows_the_log_of_a_failed_call():
    interface_file("lan0").unlink()
    quiet = complaint("block", "show", "lan0", status=CALL_FAILED)
    lines = kovanet("block", "show", "lan0", "--verbose", status=CALL_FAILED).stderr.splitlines()
    assert re.fullmatch(r"kovanet\[\d+\]: net_get_if_block:\d+ Failed to get key \[BLOCK_CNT\]", lines[0])
    assert lines[-1] == f"kovanet: {quiet}"


def test_output_that_cannot_be_written_is_a_failure():
    with open("/dev/full", "w") as full:
        done = subprocess.run([KOVANET, "card", "list"], stdout=full, stderr=subprocess.PIPE, text=True, check=False)
    assert (done.returncode, done.stderr) == (CALL_FAILED, "kovanet: cannot write the output: No space left on device\n")


@pytest.mark.parametrize("words", ["--version", "--help", "card --help", "check address 1.2.3", "ports used tcp 1"])
def test_an_answer_that_cannot_be_written_is_a_failure(words):
    with open("/dev/full", "w") as full:
        done = subprocess.run([KOVANET, *words.split()], stdout=full, stderr=subprocess.PIPE, text=True, check=False)
    assert (done.returncode, done.stderr) == (CALL_FAILED, "kovanet: cannot write the output: No space left on device\n")


def test_numbers_are_decimal():
    assert data("ports", "used", "tcp", "010", status=None)["low"] == 10
    assert complaint("ports", "used", "tcp", "65536", status=NO) == (
        'port "65536" is not valid: it is a number from 0 to 65535')


@pytest.mark.parametrize("words", ["dns set [10.9.0.1,10.9.0.2]", "stats [lan0]", "dns set 10.9.0.1 [10.9.0.2]"])
def test_repeated_words_are_taken_as_they_are_typed(words):
    before = everything()
    text = complaint(*words.split(), status=None)
    assert words.split()[-1] in text and everything() == before


def test_several_words_are_several_still():
    assert [one["name"] for one in data("stats", "lo", "lan0", "eth0")] == ["eth0", "lan0", "lo"]
    assert "--help" in complaint("dns", "set", "--json", status=USAGE)


@pytest.mark.parametrize("name", ["lan%d", "lan:1", "%"])
def test_a_name_that_the_kernel_would_complete_is_refused(name):
    run("ip", "link", "set", "lan0", "down")
    assert '"%"' in complaint("link", "rename", "lan0", name, status=NO)
    assert '"%"' in complaint("bridge", "set", name, "master", "lan0", "--yes", status=NO)
    assert link_of("lan0") and not interface_file(name).exists()


def test_a_file_that_cannot_be_read_is_no_answer(keep):
    kovainfo = pathlib.Path("/etc/kovainfo.conf")
    keep(kovainfo).unlink()
    kovainfo.mkdir()
    try:
        assert complaint("dns", "show", status=CALL_FAILED).startswith("cannot read dns_mode of /etc/kovainfo.conf: NET_ERR")
    finally:
        kovainfo.rmdir()


@pytest.mark.parametrize("name,shown", [("a\u009b31m", "a?31m"), ("a\udc9b31m", "a?31m"), ("é€", "é€"), ("a\udcc3", "a?")])
def test_the_name_of_an_interface_is_text_to_the_terminal(name, shown):
    run("ip", "link", "add", name, "type", "veth", "peer", "name", "peer")
    try:
        for words in (("link", "show"), ("stats",)):
            assert shown in [line.split()[0] for line in kovanet(*words).stdout.splitlines() if line]
    finally:
        run("ip", "link", "del", "peer")


def test_the_name_of_an_interface_cannot_write_to_the_terminal():
    name = "a\x1b[31m"
    run("ip", "link", "add", name, "type", "veth", "peer", "name", "peer")
    try:
        assert "a?[31m" in kovanet("stats").stdout
        assert name in [one["name"] for one in data("stats")]
        for words in (("link", "show"), ("addr", "list"), ("card", "list"), ("stats",)):
            assert "\x1b" not in kovanet(*words).stdout
            assert "\x1b" not in kovanet(*words, "--json").stdout
        assert "peer" in [link["name"] for link in data("link", "show")]
    finally:
        run("ip", "link", "del", "peer")


COMMANDS = ["", "card", "card list", "card show", "card set", "link", "link show", "link up", "link down", "link rename",
            "addr", "addr list", "addr add", "addr del", "addr flush", "stats", "block", "block show", "block set",
            "gateway", "gateway show", "gateway set", "gateway clear", "route", "route check", "route add", "route del",
            "dns", "dns show", "dns set", "dns mode", "dns update", "hostname", "hostname show", "hostname set",
            "service", "service notify",
            "check", "check address", "check mask", "check prefix", "check ipv6", "check hostname", "check domain"]  # fmt: skip


@pytest.mark.parametrize("words", COMMANDS)
def test_help_has_examples_and_exit_codes(words):
    printed = kovanet(*words.split(), "--help").stdout
    assert f"Usage: {' '.join(['kovanet', *words.split()])}" in printed
    assert "Examples:\n  kovanet " in printed
    for code in ("0 done", "1 no", "2 usage", "3 not found", "4 the library call failed", "5 needs root"):
        assert code in printed


def test_the_examples_of_the_help_are_understood():
    """Every example that only reads works as it stands."""
    for name in ("card", "link", "addr", "gateway", "dns", "hostname", "check"):
        examples = re.findall(r"^  kovanet (.+)$", kovanet(name, "--help").stdout, re.MULTILINE)
        assert examples
        for example in examples:
            if example.split()[1] in ("list", "show") or name == "check":
                kovanet(*example.split())
