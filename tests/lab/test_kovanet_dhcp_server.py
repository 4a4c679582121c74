# box: --link eth0 --link lan0
"""kovanet dhcp-server, compared with the files below /etc/dhcpd, with the library, and with what the server runs on."""

import contextlib
import ctypes
import pathlib
import re
import shutil
import time

import pytest
from conftest import (
    CALL_FAILED, DONE, KOVANET, NO, NO_PERMISSION, NOT_FOUND, USAGE, DhcpServer, complaint, data, documented,
    held_configuration_lock, kovanet, on_other_side, processes, run,
)  # fmt: skip
from sdk import DhcpTagConf, library

FILES = pathlib.Path("/etc/dhcpd")
SERVER = "dnsmasq --conf-file=/run/kova/dhcp-server/dnsmasq.conf"
SERVED = pathlib.Path("/run/kova/dhcp-server/dnsmasq.conf")
RANGE = ("range", "192.168.60.10", "192.168.60.20", "mask", "255.255.255.0", "router", "192.168.60.1")
SUBNET = ("subnet", "set", "eth0", "0", *RANGE)
SUBNET6 = ("subnet", "set", "eth0", "0", "6", "mode", "ra-only", "dns", "2001:db8::53")
ON, OFF = 'enable="yes"\n', 'enable="no"\n'


def server(*words, **options):
    return kovanet("dhcp-server", *words, **options)


def told(*words, **options):
    return data("dhcp-server", *words, **options)


def refused(*words, status=NO):
    """The complaint about a command that changes nothing."""
    before = everything()
    text = complaint("dhcp-server", *words, status=status)
    assert everything() == before
    return text


def everything():
    return {path.name: path.read_bytes() for path in FILES.iterdir()} if FILES.exists() else None


def text_of(name):
    return (FILES / name).read_text()


def put(name, text):
    FILES.mkdir(exist_ok=True)
    (FILES / name).write_text(text)


def running():
    return processes(SERVER)


@pytest.fixture(autouse=True)
def clean_server():
    shutil.rmtree(FILES, ignore_errors=True)
    for link, address in (("eth0", "192.168.60.1/24"), ("lan0", "192.168.61.1/24")):
        run("ip", "addr", "replace", address, "dev", link)
        run("ip", "link", "set", link, "up")
    yield
    shutil.rmtree(FILES, ignore_errors=True)
    run("/etc/rc.network", "nat-restart-dhcp")
    assert not running()


@pytest.fixture
def service():
    """The service is on and serves the subnet 0 of eth0."""
    put("dhcpd.info", ON)
    server(*SUBNET, "--no-restart")
    server("enable", "eth0")
    assert running()


@contextlib.contextmanager
def interface(name):
    run("ip", "link", "add", "name", name, "type", "veth", "peer", "name", "far")
    try:
        yield
    finally:
        run("ip", "link", "del", "far")


# ---- switches -------------------------------------------------------------------------------------------------------


def test_status_without_files():
    assert told("status") == {"service": False, "pxe": False, "interfaces": []}
    assert server("status").stdout == "service: off\npxe:     off\n"
    assert not FILES.exists()


def test_enable_and_disable_switch_one_family():
    server("enable", "eth0")
    server("enable", "lan0", "6")
    assert text_of("dhcpd-eth0.info") == text_of("dhcpd6-lan0.info") == ON
    assert told("status")["interfaces"] == [
        {"interface": "eth0", "family": 4, "enabled": True, "subnets": 0},
        {"interface": "lan0", "family": 6, "enabled": True, "subnets": 0},
    ]  # fmt: skip
    server("disable", "eth0", "4")
    assert text_of("dhcpd-eth0.info") == OFF
    assert {path.name for path in FILES.iterdir()} == {"dhcpd-eth0.info", "dhcpd6-lan0.info"}
    assert library.DHCPInterfaceIsEnabled(b"eth0", 0) == 0 and library.DHCPInterfaceIsEnabled(b"lan0", 1) == 1


def test_status_counts_subnets_and_tells_the_switches():
    server(*SUBNET)
    server("subnet", "set", "eth0", "1", "range", "10.1.0.10", "10.1.0.20", "mask", "255.255.0.0", "router", "10.1.0.1")
    server(*SUBNET6)
    server("pxe", "set", "local", "pxelinux.0")
    put("dhcpd.info", ON)
    status = told("status")
    assert status == {"service": True, "pxe": True, "interfaces": [
        {"interface": "eth0", "family": 4, "enabled": False, "subnets": 2},
        {"interface": "eth0", "family": 6, "enabled": False, "subnets": 1},
    ]}  # fmt: skip
    lines = server("status").stdout.splitlines()
    assert lines[3].split() == ["INTERFACE", "FAMILY", "STATE", "SUBNETS"]
    assert lines[4].split() == ["eth0", "IPv4", "off", "2"]


@pytest.mark.parametrize("name", ["eth0.10", "a-b", "a'b", "-x", "ä"])
def test_odd_names_of_interfaces_are_served(name):
    with interface(name):
        server("enable", "--", name)
        server("subnet", "set", "--", name, "0", *RANGE)
        server("option", "set", "--", name, "0", "mtu", "1400")
        assert text_of(f"dhcpd-{name}.info") == ON
        assert f"interface={name}\ndhcp-range=set:{name}0,192.168.60.10," in text_of(f"dhcpd-{name}-subnet0.conf")
        assert told("status")["interfaces"] == [{"interface": name, "family": 4, "enabled": True, "subnets": 1}]
        [subnet] = told("subnet", "list")
        assert (subnet["interface"], subnet["options"]) == (name, 1)
    server("disable", "--", name)
    assert text_of(f"dhcpd-{name}.info") == OFF, "also when the interface is gone"


@pytest.mark.parametrize("name", ["a,b", "pxe", "eth0-subnet0", "eth0-static"])
def test_interface_that_the_files_cannot_name_is_refused(name):
    with interface(name):
        assert refused("enable", name).startswith(f"the server cannot serve {name}: ")
        assert refused("subnet", "set", name, "0", *RANGE).startswith(f"the server cannot serve {name}: ")


def test_files_of_other_kinds_are_no_interfaces():
    for name in ("dhcpd-pxe", "dhcpd-eth0-lan", "dhcpd-eth0-static", "wpad-eth0", "dhcpd-eth0-subnet07",
                 "dhcpd-eth0-subnet4294967296", "dhcpd-eth0-subnet", "dhcpd-", "dhcpd--subnet0"):  # fmt: skip
        put(f"{name}.info", ON)
        put(f"{name}.conf", "")
    assert told("status")["interfaces"] == [] and told("subnet", "list") == []


# ---- the running server ---------------------------------------------------------------------------------------------


def test_changes_restart_a_service_that_is_on(service):
    [first] = running()
    server("option", "set", "eth0", "0", "mtu", "1400")
    [second] = running()
    assert first != second and "dhcp-option=tag:eth00,option:mtu,1400" in SERVED.read_text()
    server("option", "del", "eth0", "0", "mtu", "--no-restart")
    assert running() == [second] and "mtu" in SERVED.read_text()
    server("restart")
    assert "mtu" not in SERVED.read_text()
    server("subnet", "off", "eth0", "0")
    assert not running()


@pytest.mark.parametrize("words", ["vendor set MSFT 2 1i", "vendor del MSFT", "pxe set local a", "pxe off",
                                   "subnet set lan0 0 6 mode ra-only dns 2001:db8::53", "enable lan0", "disable lan0",
                                   "subnet set eth0 0 lease 600"])  # fmt: skip
def test_every_change_restarts(service, words):
    server("vendor", "set", "MSFT", "1", "x", "--no-restart")
    before = running()
    server(*words.split(), "--no-restart")
    assert running() == before
    if words != "vendor del MSFT":
        server(*words.split())
        assert running() and running() != before


def test_service_that_is_off_is_not_started():
    server("enable", "eth0")
    server(*SUBNET)
    assert not running()
    server("restart")
    assert not running()


def test_restart_that_fails_is_told_and_the_change_stays(service, keep):
    keep("/usr/sbin/dnsmasq").unlink()
    text = complaint("dhcp-server", "subnet", "set", "eth0", "0", "lease", "600", status=CALL_FAILED)
    assert text == "the change is stored, but the DHCP server does not restart; the system log tells why"
    assert told("subnet", "show", "eth0", "0")["lease_seconds"] == 600
    assert complaint("dhcp-server", "restart", status=CALL_FAILED).startswith("the DHCP server does not restart; ")


# ---- subnets --------------------------------------------------------------------------------------------------------


def test_subnet_set_then_show():
    server(*SUBNET, "domain", "lab.example", "dns", "192.168.60.53", "192.168.60.54", "1.1.1.1", "lease", "7200")
    assert text_of("dhcpd-eth0-subnet0.conf") == (
        "interface=eth0\ndhcp-range=set:eth00,192.168.60.10,192.168.60.20,255.255.255.0,7200\n"
        "dhcp-option=tag:eth00,option:router,192.168.60.1\n"
        "dhcp-option=tag:eth00,option:domain-search,lab.example\ndhcp-option=tag:eth00,option:domain-name,lab.example\n"
        "dhcp-option=tag:eth00,option:dns-server,192.168.60.53,192.168.60.54,1.1.1.1\n")  # fmt: skip
    assert text_of("dhcpd-eth0-subnet0.info") == ON
    shown = told("subnet", "show", "eth0", "0")
    assert shown == {
        "interface": "eth0", "number": 0, "family": 4, "enabled": True, "readable": True, "mode": None,
        "start": "192.168.60.10", "end": "192.168.60.20", "mask": "255.255.255.0", "router": "192.168.60.1",
        "domain": "lab.example", "dns": ["192.168.60.53", "192.168.60.54", "1.1.1.1"], "lease_seconds": 7200,
        "options": 0,
    }  # fmt: skip
    assert told("subnet", "list") == [shown]
    conf = DhcpTagConf()
    assert library.DHCPTagConfGet(b"eth0", 0, 0, ctypes.byref(conf)) == 1
    assert (conf.start_ip, conf.router, conf.lease_time, conf.domain) == (
        b"192.168.60.10", b"192.168.60.1", 7200, b"lab.example")  # fmt: skip
    lines = dict(line.split(":", 1) for line in server("subnet", "show", "eth0", "0").stdout.splitlines())
    assert lines["range"].split() == ["192.168.60.10", "192.168.60.20"] and lines["lease"].strip() == "7200 s"


def test_subnet_keeps_what_is_not_given():
    server(*SUBNET, "domain", "lab.example", "dns", *[f"10.0.0.{host}" for host in range(1, 6)])
    server("option", "set", "eth0", "0", "ntp-server", "10.0.0.9")
    before = told("subnet", "show", "eth0", "0")
    for keys, changed in ((["lease", "600"], {"lease_seconds": 600}), (["dns", "none"], {"dns": []}),
                          (["domain", "none"], {"domain": None}), ([], {}), (["router", "192.168.60.2"],
                          {"router": "192.168.60.2"})):  # fmt: skip
        server("subnet", "set", "eth0", "0", *keys)
        before |= changed
        assert told("subnet", "show", "eth0", "0") == before
    assert [option["name"] for option in told("option", "list", "eth0", "0")] == ["ntp-server"]


def test_subnet_off_and_on_keeps_its_fragment():
    server(*SUBNET)
    before = text_of("dhcpd-eth0-subnet0.conf")
    server("subnet", "off", "eth0", "0")
    assert text_of("dhcpd-eth0-subnet0.info") == OFF and told("subnet", "show", "eth0", "0")["enabled"] is False
    server("subnet", "set", "eth0", "0")
    assert text_of("dhcpd-eth0-subnet0.info") == ON and text_of("dhcpd-eth0-subnet0.conf") == before


@pytest.mark.parametrize("mode,keys,line", [
    ("ra-only", [], "dhcp-range=set:eth0v60,::,constructor:eth0,ra-only,64,86400"),
    ("ra-stateless", ["lease", "600"], "dhcp-range=set:eth0v60,::,constructor:eth0,ra-stateless,64,600"),
    ("stateful", ["range", "2001:db8::10", "2001:db8::20"],
     "dhcp-range=set:eth0v60,2001:db8::10,2001:db8::20,64,86400"),
])  # fmt: skip
def test_ipv6_subnet_set_then_show(mode, keys, line):
    servers = ["2001:db8::1", "2001:db8::2", "2001:db8::3"]
    server("subnet", "set", "eth0", "0", "6", "mode", mode, "dns", *servers, *keys)
    lines = text_of("dhcpd6-eth0-subnet0.conf").splitlines()
    assert lines[:3] == ["interface=eth0", line, "dhcp-option=tag:eth0v60,option6:dns-server,"
                         + ",".join(f"[{one}]" for one in servers)]  # fmt: skip
    assert ("enable-ra" in lines) == (mode == "stateful")
    shown = told("subnet", "show", "eth0", "0", "6")
    assert (shown["mode"], shown["dns"], shown["family"], shown["enabled"]) == (mode, servers, 6, True)
    assert [shown["start"], shown["end"]] == (keys[1:] if mode == "stateful" else [None, None])
    server("subnet", "set", "eth0", "0", "6", "lease", "700")
    assert told("subnet", "show", "eth0", "0", "6") == shown | {"lease_seconds": 700}
    server("subnet", "set", "eth0", "0", "6", "mode", "ra-only")
    assert told("subnet", "show", "eth0", "0", "6")["mode"] == "ra-only"
    server("subnet", "off", "eth0", "0", "6")
    assert text_of("dhcpd6-eth0-subnet0.info") == OFF and told("subnet", "show", "eth0", "0", "6")["enabled"] is False


def test_subnets_are_numbered_without_a_gap():
    assert "eth0 has no subnet 0" in refused("subnet", "set", "eth0", "1", *RANGE)
    server(*SUBNET)
    server("subnet", "set", "eth0", "1", "range", "10.1.0.10", "10.1.0.20", "mask", "255.255.0.0", "router", "10.1.0.1")
    assert [one["number"] for one in told("subnet", "list")] == [0, 1]


def test_conflict_with_another_interface_is_refused_unless_forced():
    server("enable", "eth0")
    server(*SUBNET)
    wide = ("subnet", "set", "lan0", "0", "range", "192.168.1.1", "192.168.1.9", "mask", "255.255.0.0",
            "router", "192.168.2.1")  # fmt: skip
    assert refused(*wide) == "the subnet overlaps one of eth0; with --force it is set all the same"
    server(*wide, "--force")
    assert told("subnet", "show", "lan0", "0")["mask"] == "255.255.0.0"
    server("subnet", "set", "lan0", "0", "lease", "600")
    server(*SUBNET)  # own subnets are no conflict


def test_conflict_is_answered():
    server("enable", "eth0")
    server(*SUBNET)
    question = ("conflict", "lan0", "192.168.60.200", "192.168.60.201", "255.255.255.0")
    answer = told(*question, status=NO)
    assert (answer["conflict"], answer["conflict_interface"]) == (True, "eth0")
    assert server(*question, status=NO).stdout == "the subnet overlaps one of eth0\n"
    for free in (("conflict", "eth0", *question[2:]), ("conflict", "lan0", "10.0.0.1", "10.0.0.2", "255.0.0.0")):
        assert told(*free)["conflict"] is False and server(*free).stdout == "no conflict\n"
    put("dhcpd-eth0-subnet0.conf", "dhcp-range=bogus\n")
    assert refused(*question, status=CALL_FAILED).startswith("cannot read the subnets of the other interfaces")


def test_fragment_that_cannot_be_read_hides_no_other():
    server(*SUBNET)
    put("dhcpd-eth0-subnet1.conf", "interface=eth0\n")
    put("dhcpd-eth0-subnet1.info", ON)
    good, bad = told("subnet", "list")
    assert good["readable"] and not bad["readable"] and bad["start"] is None and bad["enabled"]
    assert list(good) == list(bad)
    assert "unreadable" in server("subnet", "list").stdout
    assert "cannot read subnet 1 of eth0" in refused("subnet", "show", "eth0", "1", status=CALL_FAILED)
    assert "needs router" in refused("subnet", "set", "eth0", "1", "range", "10.1.0.1", "10.1.0.2", "mask", "255.0.0.0",
                                     status=USAGE)  # fmt: skip
    server("subnet", "set", "eth0", "1", "range", "10.1.0.1", "10.1.0.2", "mask", "255.0.0.0", "router", "10.0.0.1")
    assert told("subnet", "show", "eth0", "1")["readable"]


@pytest.mark.parametrize("line", ["dhcp-option=tag:eth00,252,http://x/wpad.dat", "dhcp-option=3,1.2.3.4",
                                  "dhcp-option=tag:eth00,option:mtu,12"])  # fmt: skip
def test_lines_of_others_are_not_lost(line):
    server(*SUBNET)
    put("dhcpd-eth0-subnet0.conf", text_of("dhcpd-eth0-subnet0.conf") + line + "\n")
    for words in (("subnet", "set", "eth0", "0", "lease", "600"), ("option", "set", "eth0", "0", "mtu", "1400"),
                  ("option", "del", "eth0", "0", "mtu")):  # fmt: skip
        assert "edit it by hand" in refused(*words)


# ---- options --------------------------------------------------------------------------------------------------------

# an option of each rule, values that it takes, values that it does not, and what the refusal says
RULES = [
    ("boot-file-size", ["0", "65536"], ["65537", "-1", "1x", "", " 1"], "takes a number from 0 to 65536, not"),
    ("max-datagram-reassembly", ["576", "65536"], ["575", "65537"], "a number from 576 to 65536"),
    ("default-ttl", ["1", "255"], ["0", "256"], "a number from 1 to 255"),
    ("mtu", ["68", "65536"], ["67", "65537", "0x44"], "a number from 68 to 65536"),
    ("ip-forward-enable", ["0", "1"], ["2", "yes"], "takes 0 or 1, not"),
    ("arp-timeout", ["0", "18446744073709551615"], ["18446744073709551616", "x"], "a number from 0 to 1844674407370"),
    ("netbios-nodetype", ["1", "2", "4", "8"], ["3", "16", "08"], "1, 2, 4 or 8"),
    ("swap-server", ["10.0.0.1"], ["10.0.0.256", "host", "127.0.0.1", ""], "takes one IPv4 address, not"),
    ("nis-domain", ["lab.example", "{}", "[a]", "list", "a b", "ü", "'", "%s"],
     ["", "a,b", 'a"b', "a\nb", "a\tb", "a #b", " a", "a "], "takes one text, not"),
    ("ntp-server", ["10.0.0.1"], ["ntp.local", "10.0.0.1,10.0.0.2", "fe80::1"], "one or more IPv4 addresses, not"),
]  # fmt: skip


@pytest.mark.parametrize("name,good,bad,rule", RULES, ids=[rule[0] for rule in RULES])
def test_option_takes_what_its_rule_says(name, good, bad, rule):
    server(*SUBNET)
    for value in good:
        server("option", "set", "eth0", "0", "--", name, value)
        [option] = told("option", "list", "eth0", "0")
        assert (option["name"], option["values"]) == (name, [value])
        assert text_of("dhcpd-eth0-subnet0.conf").endswith(f"dhcp-option=tag:eth00,option:{name},{value}\n")
    for value in bad:
        assert rule in refused("option", "set", "eth0", "0", "--", name, value)


@pytest.mark.parametrize("name,values,rule", [
    ("policy-filter", ["10.0.0.1"], 'pairs of an IPv4 address and a mask: "10.0.0.1" is alone'),
    ("policy-filter", ["10.0.0.1", "255.0.255.0"], "without a gap"),
    ("classless-static-route", ["10.1.0.0/16"], '"10.1.0.0/16" is alone'),
    ("classless-static-route", ["10.1.0.0/33", "10.0.0.1"], "a length from 0 to 32"),
    ("classless-static-route", ["10.1.0.0", "10.0.0.1"], "a length from 0 to 32"),
    ("classless-static-route", ["10.1.0.0/16", "gw"], "four numbers"),
    ("ntp-server", ["10.0.0.1", "ntp.local"], 'not "ntp.local": an IPv4 address is four numbers'),
    ("mtu", ["1400", "1500"], "a number from 68 to 65536, not 2 values"),
    ("nis-domain", ["a", "b"], "one text, not 2 values"),
])  # fmt: skip
def test_refused_values_are_told_the_rule(name, values, rule):
    server(*SUBNET)
    text = refused("option", "set", "eth0", "0", name, *values)
    assert text.startswith(f"option {name} takes ") and rule in text


def test_option_lists_are_written_and_read_in_order():
    server(*SUBNET)
    lists = {"log-server": ["10.0.0.3", "10.0.0.1"], "classless-static-route": ["10.1.0.0/16", "10.0.0.1", "10.2.0.0/0",
             "10.0.0.2"], "policy-filter": ["10.1.0.0", "255.255.0.0"]}  # fmt: skip
    for name, values in lists.items():
        server("option", "set", "eth0", "0", name, *values)
    assert {one["name"]: one["values"] for one in told("option", "list", "eth0", "0")} == lists
    server("option", "set", "eth0", "0", "7", "012.0.0.0x3")
    assert [one["name"] for one in told("option", "list", "eth0", "0")] == list(lists)
    assert told("option", "list", "eth0", "0")[0]["values"] == ["10.0.0.3"], "as the server takes it"
    server("option", "del", "eth0", "0", "classless-static-route")
    assert [one["number"] for one in told("option", "list", "eth0", "0")] == [7, 21]
    lines = server("option", "list", "eth0", "0").stdout.splitlines()
    assert [line.split() for line in lines] == [["NUMBER", "NAME", "VALUE"], ["7", "log-server", "10.0.0.3"],
                                                ["21", "policy-filter", "10.1.0.0", "255.255.0.0"]]  # fmt: skip
    assert refused("option", "del", "eth0", "0", "mtu", status=NOT_FOUND) == "the subnet has no option mtu"


def test_option_names_are_helped_with():
    server(*SUBNET)
    assert refused("option", "set", "eth0", "0", "ntp-sever", "1.2.3.4").endswith("; did you mean ntp-server?")
    assert "did you mean" not in refused("option", "set", "eth0", "0", "elephant", "1.2.3.4")
    for name in ("0", "43", "255", "router", "dns-server", "", "MTU2000"):
        assert "no option that can be set is called" in refused("option", "set", "eth0", "0", name, "1")


def test_tool_and_library_know_the_same_options():
    """Of every option, the library reads back what the tool wrote; and it reads no option that the tool does not know."""
    server(*SUBNET)
    fragment = text_of("dhcpd-eth0-subnet0.conf")
    header = (pathlib.Path(__file__).resolve().parents[2] / "include" / "kovanetsdk" / "dhcp.h").read_text()
    table = header[header.index("What each number\n * takes"):header.index("typedef struct DHCP_OPTION {")]
    known = {int(number): name for name, number in re.findall(r"([a-zA-Z][\w+-]+) (\d+)(?=[,\s(:])", table)
             if name not in ("IPv4", "to", "and", "or")}  # fmt: skip
    assert len(known) == 40
    for number, name in known.items():
        put("dhcpd-eth0-subnet0.conf", fragment)
        for values in (["1"], ["600"], ["10.0.0.1"], ["10.1.0.0", "255.255.0.0"], ["10.1.0.0/16", "10.0.0.1"]):
            if kovanet("dhcp-server", "option", "set", "eth0", "0", name, *values, status=None).returncode == DONE:
                assert told("option", "list", "eth0", "0") == [{"number": number, "name": name, "values": values}]
                break
        else:
            pytest.fail(f"no value suits {name}")
        server("option", "set", "eth0", "0", str(number), *values)
        takes_list = "takes one or more" in (text := refused("option", "set", "eth0", "0", name, "?" * 3 + ","))
        assert library.DHCPOptionIsListValue(number) == (takes_list or "takes pairs" in text)
    assert [number for number in range(256) if library.DHCPOptionIsListValue(number) and number not in known] == []


# ---- lengths --------------------------------------------------------------------------------------------------------

TEXTS = {  # what comes before and after a text in its line
    "option": (["option", "set", "eth0", "0", "nis-domain"], [], "dhcp-option=tag:eth00,option:nis-domain,", ""),
    "vendor": (["vendor", "set", "MSFT", "2"], [], "dhcp-option=vendor:MSFT,2,", ""),
    "class": (["vendor", "set"], ["2", "x"], "dhcp-option=vendor:", ",2,x"),
    "pxe local": (["pxe", "set", "local"], [], "dhcp-boot=tag:pxe,", ""),
    "pxe remote": (["pxe", "set", "remote", "10.0.0.5"], [], "dhcp-boot=tag:pxe,", ",bootserver,10.0.0.5"),
}  # fmt: skip


@pytest.mark.parametrize("words,more,begin,end", TEXTS.values(), ids=TEXTS)
def test_longest_text_is_written_whole_and_longer_ones_are_refused(words, more, begin, end):
    server(*SUBNET)
    longest = 1023 - len(begin) - len(end)
    server(*words, "x" * longest, *more)
    assert any(f"{begin}{'x' * longest}{end}\n" in path.read_text() for path in FILES.glob("*.conf"))
    shown = server(*{"option": ("option", "list", "eth0", "0"), "vendor": ("vendor", "show", "MSFT"),
                     "pxe": ("pxe", "show")}[words[0]]).stdout if more == [] else server("vendor", "list").stdout
    assert "x" * longest in shown and "x" * (longest + 1) not in shown
    for length in sorted({longest + 1, 1023, 1024, 4096}):
        over = length - longest
        assert refused(*words, "x" * length, *more).endswith(f"it is {over} characters too long for a line of the "
                                                             "server's file")  # fmt: skip


@pytest.mark.parametrize("words,more", [(words, more) for words, more, _, _ in TEXTS.values()], ids=TEXTS)
@pytest.mark.parametrize("text", ["", "a,b", "a\nenable=no", "a\rb", 'a"b', "\x1b[31m", "a #b", "\x7f"])
def test_text_that_would_change_its_line_is_refused(words, more, text):
    server(*SUBNET)
    refused(*words, "--", text, *more)


def test_longest_list_and_domain():
    server(*SUBNET)
    fits = [f"10.0.{host // 250}.{host % 250 + 1}" for host in range(80)]
    server("subnet", "set", "eth0", "0", "dns", *fits)
    assert told("subnet", "show", "eth0", "0")["dns"] == fits
    for many in (fits * 2, fits * 10):
        assert "too long for a line" in refused("subnet", "set", "eth0", "0", "dns", *many)
        assert "too long for a line" in refused("option", "set", "eth0", "0", "ntp-server", *many)
    domain = "x" * 63 + ".example" * 23
    server("subnet", "set", "eth0", "0", "domain", domain)
    assert told("subnet", "show", "eth0", "0")["domain"] == domain
    for length in (254, 1023, 1024, 4096):
        assert "at most 253" in refused("subnet", "set", "eth0", "0", "domain", "x" * length)


# ---- vendor classes and network boot --------------------------------------------------------------------------------


def test_vendor_options_are_set_replaced_and_deleted():
    assert told("vendor", "list") == []
    server("vendor", "set", "MSFT", "2", "1i")
    server("vendor", "set", "PXEClient", "43", "06:01:03")
    server("vendor", "set", "MSFT", "1", "10.0.0.1")
    server("vendor", "set", "MSFT2", "2", "x y")
    server("vendor", "set", "MSFT", "002", "2i")
    assert sorted(text_of("dhcpd-vendor.conf").splitlines()) == [
        "dhcp-option=vendor:MSFT,1,10.0.0.1", "dhcp-option=vendor:MSFT,2,2i", "dhcp-option=vendor:MSFT2,2,x y",
        "dhcp-option=vendor:PXEClient,43,06:01:03"]  # fmt: skip
    assert {one["class"]: one["options"] for one in told("vendor", "list")} == {"MSFT": 2, "PXEClient": 1, "MSFT2": 1}
    assert {one["number"]: one["value"] for one in told("vendor", "show", "MSFT")} == {1: "10.0.0.1", 2: "2i"}
    server("vendor", "del", "MSFT", "2")
    assert told("vendor", "show", "MSFT") == [{"number": 1, "value": "10.0.0.1"}]
    assert "has no option 2" in refused("vendor", "del", "MSFT", "2", status=NOT_FOUND)
    server("vendor", "del", "MSFT")
    assert {one["class"] for one in told("vendor", "list")} == {"PXEClient", "MSFT2"}
    for words in (("vendor", "show", "MSFT"), ("vendor", "del", "MSFT"), ("vendor", "del", "MSFT", "1")):
        refused(*words, status=NOT_FOUND)
    for number in ("0", "255", "12a", "", "99999999999999999999"):
        assert "from 1 to 254" in refused("vendor", "set", "MSFT", number, "x")


def test_vendor_line_that_cannot_be_read_is_told_and_can_be_removed():
    put("dhcpd-vendor.conf", "dhcp-option=vendor:MSFT,2,a,b\ndhcp-option=vendor:B,3,x\n")
    assert "cannot read the options of vendor class MSFT" in refused("vendor", "show", "MSFT", status=CALL_FAILED)
    refused("vendor", "del", "MSFT", "2", status=CALL_FAILED)
    assert told("vendor", "list") == [{"class": "MSFT", "options": None}, {"class": "B", "options": 1}]
    server("vendor", "del", "MSFT")
    assert text_of("dhcpd-vendor.conf") == "dhcp-option=vendor:B,3,x\n"


def test_pxe_set_show_off():
    nothing = {"enabled": False, "mode": None, "local_file": None, "remote_server": None, "remote_file": None}
    assert told("pxe", "show") == nothing
    server("pxe", "set", "local", "boot/a b.0")
    local = nothing | {"enabled": True, "mode": "local", "local_file": "boot/a b.0"}
    assert told("pxe", "show") == local
    assert text_of("dhcpd-pxe.conf") == "dhcp-boot=tag:pxe,boot/a b.0\ndhcp-vendorclass=set:pxe,PXEClient\n"
    server("pxe", "set", "remote", "012.0.0.5", "pxelinux.0")
    remote = local | {"mode": "remote", "remote_server": "10.0.0.5", "remote_file": "pxelinux.0"}
    assert told("pxe", "show") == remote
    assert text_of("dhcpd-pxe.conf").startswith("dhcp-boot=tag:pxe,pxelinux.0,bootserver,10.0.0.5\n")
    assert text_of("dhcpd-pxe.info") == ON
    server("pxe", "off")
    assert told("pxe", "show") == remote | {"enabled": False} and text_of("dhcpd-pxe.info") == OFF
    assert dict(line.split(":", 1) for line in server("pxe", "show").stdout.splitlines())["remote file"].strip() \
        == "pxelinux.0"
    for address in ("10.0.0.256", "server", "fe80::1", ""):
        refused("pxe", "set", "remote", address, "pxelinux.0")


# ---- the client -----------------------------------------------------------------------------------------------------


def test_client_tells_the_offer(tmp_path):
    with DhcpServer("lan0", "192.168.61", folder=tmp_path):
        offer = told("test-client", "lan0", timeout=60)
    assert offer["interface"] == "lan0" and offer["mask"] == "255.255.255.0"
    assert offer["address"] in [f"192.168.61.{host}" for host in range(10, 21)]
    assert "no DHCP server offers an address on lan0" in refused("test-client", "lan0", status=CALL_FAILED)
    on_other_side("ip", "addr", "flush", "dev", "lan0")


# ---- bad input ------------------------------------------------------------------------------------------------------

BAD = {
    "": USAGE, "stat": USAGE, "status more": USAGE, "enable": USAGE, "enable eth0 5": USAGE, "enable eth0 4 6": USAGE,
    "subnet": USAGE, "subnet lits": USAGE, "subnet show eth0": USAGE, "subnet show eth0 0 5": USAGE, "subnet set": USAGE,
    "subnet set eth0 0 rnage a b": USAGE, "subnet set eth0 0 range 192.168.60.10": USAGE, "subnet set eth0 0 dns": USAGE,
    "subnet set eth0 0 lease 600 lease 700": USAGE, "subnet set eth0 0 mode ra-only": USAGE,
    "subnet set eth0 0 6 mask 255.0.0.0": USAGE, "subnet set eth0 0 6 mode off dns 2001:db8::53": USAGE,
    "subnet set eth0 0 6 mode ra-only": USAGE, "subnet set eth0 0 6 mode stateful dns 2001:db8::53": USAGE,
    "subnet set eth0 1 range 10.1.0.1 10.1.0.2": USAGE, "subnet off eth0": USAGE, "option": USAGE, "option lst": USAGE,
    "option list eth0": USAGE, "option set eth0 0": USAGE, "option set eth0 0 mtu": USAGE, "option del eth0 0": USAGE,
    "vendor": USAGE, "vendor show": USAGE, "vendor set MSFT 2": USAGE, "vendor set MSFT 2 a b": USAGE, "pxe": USAGE,
    "pxe set": USAGE, "pxe set local": USAGE, "pxe set local a b": USAGE, "pxe set remote a": USAGE,
    "pxe set tftp a": USAGE, "pxe off now": USAGE, "conflict lan0 10.0.0.1 10.0.0.2": USAGE, "test-client": USAGE,
    "restart eth0": USAGE, "status --no-restart": USAGE, "option set eth0 0 mtu 1400 --force": USAGE,
    "enable a/b": NO, "enable ../eth0": NO, "enable ..": NO, "enable seventeen-letters": NO, f"enable {'n' * 4096}": NO,
    "disable a/b": NO, "subnet show a/b 0": NO, "subnet set ../eth0 0": NO, "subnet off .. 0": NO, "subnet show eth0 x": NO,
    "subnet show eth0 4294967296": NO, "option list a/b 0": NO, "option set a/b 0 mtu 1400": NO, "conflict a/b 10.0.0.1 "
    "10.0.0.2 255.0.0.0": NO, "test-client a/b": NO, "test-client -- -x": NO,
    "subnet set eth0 0 lease 119": NO, "subnet set eth0 0 lease infinite": NO, "subnet set eth0 0 lease 2147483648": NO,
    "subnet set eth0 0 range 192.168.60.20 192.168.60.10": NO, "subnet set eth0 0 range 192.168.60.10 192.168.61.10": NO,
    "subnet set eth0 0 range 192.168.60.10 192.168.60.255": NO, "subnet set eth0 0 range a b": NO,
    "subnet set eth0 0 mask 255.0.255.0": NO, "subnet set eth0 0 router 10.0.0.1": NO, "subnet set eth0 0 router fe80::1":
    NO, "subnet set eth0 0 dns 1.1.1.1,2.2.2.2": NO, "subnet set eth0 0 dns none 1.1.1.1": NO, "subnet set eth0 0 domain a"
    ",b": NO, "subnet set eth0 0 domain a..b": NO, "subnet set eth0 0 6 mode ra-only dns none": NO,
    "subnet set eth0 0 6 mode ra-only dns 1.1.1.1": NO, "subnet set eth0 0 6 mode ra-only dns fe80::1/64": NO,
    "subnet set eth0 0 6 mode ra-only dns 2001:db8::1 range 2001:db8::1 2001:db8::2": NO,
    "subnet set eth0 0 6 mode stateful dns 2001:db8::1 range 2001:db8::2 2001:db8::1": NO,
    "subnet set eth0 0 6 mode stateful dns 2001:db8::1 range 2001:db8::2 2001:db8:0:1::3": NO,
    "subnet set eth0 0 6 mode stateful dns 2001:db8::1 range 2001:db8::2/64 2001:db8::3": NO,
    "conflict lan0 10.0.0.1 10.0.0.2 255.0.255.0": NO, "conflict lan0 10.0.0.1 host 255.0.0.0": NO,
    "enable nope": NOT_FOUND, "enable a%b": NOT_FOUND, "subnet show a%n 0": NOT_FOUND, "disable nope": NOT_FOUND, "subnet set nope 0 range 10.0.0.1 10.0.0.2 mask 255.0.0.0 router "
    "10.0.0.3": NOT_FOUND, "subnet show eth0 1": NOT_FOUND, "subnet show lan0 0": NOT_FOUND, "subnet show eth0 0 6":
    NOT_FOUND, "subnet off eth0 1": NOT_FOUND, "option list eth0 1": NOT_FOUND, "option set eth0 1 mtu 1400": NOT_FOUND,
    "option del eth0 0 mtu": NOT_FOUND, "vendor show MSFT": NOT_FOUND, "vendor del MSFT": NOT_FOUND,
    "test-client nope": NOT_FOUND,
}  # fmt: skip


def test_bad_input_has_its_exit_code_and_changes_nothing():
    server(*SUBNET)
    for words, status in BAD.items():
        text = refused(*words.split(), status=status)
        assert status != USAGE or " --help" in text or "is not known" in text or "did you mean" in text, words


CHANGES = ["enable eth0", "disable eth0", "subnet set eth0 0 lease 600", "subnet off eth0 0", "vendor set MSFT 2 x",
           "option set eth0 0 mtu 1400", "option del eth0 0 mtu", "vendor del MSFT", "pxe set local a", "pxe off"]  # fmt: skip
READS = {"status": "status", "subnet list": "subnet", "subnet show eth0 0": "subnet", "option list eth0 0": "option list",
         "vendor list": "vendor list", "vendor show MSFT": "vendor show", "pxe show": "pxe show",
         "conflict lan0 10.0.0.1 10.0.0.2 255.0.0.0": "conflict"}  # fmt: skip


@pytest.fixture
def filled():
    server("enable", "eth0")
    server(*SUBNET)
    server("option", "set", "eth0", "0", "mtu", "1300")
    server("vendor", "set", "MSFT", "1", "y")


def test_changes_need_root(filled):
    before = everything()
    for words in (*CHANGES, "restart", "test-client eth0"):
        done = run("unshare", "--user", KOVANET, "dhcp-server", *words.split(), status=NO_PERMISSION)
        assert done.stdout == "" and done.stderr.endswith(" needs root; run it as root or with sudo\n")
    assert everything() == before


def test_reading_needs_no_root_and_has_the_documented_fields(filled):
    for words, section in READS.items():
        printed = told(*words.split())
        assert run("unshare", "--user", KOVANET, "dhcp-server", *words.split(), "--json").stdout \
            == kovanet("dhcp-server", *words.split(), "--json").stdout
        rows = printed if isinstance(printed, list) else [printed]
        for row in rows:
            assert list(row) == documented(f"kovanet dhcp-server {section}")
        assert rows
    [row] = told("status")["interfaces"]
    assert list(row) == documented("kovanet dhcp-server status, each interface")


def test_offer_has_the_documented_fields(tmp_path):
    with DhcpServer("lan0", "192.168.61", folder=tmp_path):
        assert list(told("test-client", "lan0", timeout=60)) == documented("kovanet dhcp-server test-client")
    on_other_side("ip", "addr", "flush", "dev", "lan0")


@pytest.mark.parametrize("words", ["enable lan0", "option set eth0 0 mtu 1400"])
def test_changes_wait_for_the_configuration_lock(filled, words):
    before = everything()
    with held_configuration_lock():
        begin = time.monotonic()
        assert "NET_ERR_LOCK (0x400)" in complaint("dhcp-server", *words.split(), status=CALL_FAILED)
        assert time.monotonic() - begin > 4
    assert everything() == before


def test_files_that_cannot_be_written_are_a_failure(filled):
    before = everything()
    run("mount", "--bind", FILES, FILES)
    try:
        run("mount", "-o", "remount,bind,ro", FILES)
        for words in CHANGES:
            if words not in ("enable eth0", "subnet off eth0 0"):  # the first is as it should be already
                complaint("dhcp-server", *words.split(), status=CALL_FAILED)
        assert "cannot switch the subnet off" in complaint("dhcp-server", "subnet", "off", "eth0", "0", status=CALL_FAILED)
    finally:
        run("umount", FILES)
    assert everything() == before


COMMANDS = ["", "status", "enable", "disable", "restart", "subnet", "subnet list", "subnet show", "subnet set",
            "subnet off", "option", "option list", "option set", "option del", "vendor", "vendor list", "vendor show",
            "vendor set", "vendor del", "pxe", "pxe show", "pxe set", "pxe off", "conflict", "test-client"]  # fmt: skip


def test_help_has_examples_and_exit_codes():
    for words in COMMANDS:
        printed = server(*words.split(), "--help").stdout
        assert f"Usage: {' '.join(['kovanet dhcp-server', *words.split()])}" in printed
        assert "Examples:\n  kovanet dhcp-server " in printed and "5 needs root" in printed


def test_examples_of_the_help_work():
    examples = re.findall(r"^  kovanet (dhcp-server .+)$", server("--help").stdout.replace("\\\n", ""), re.MULTILINE)
    assert len(examples) > 20
    for example in examples:
        if "test-client" not in example:
            kovanet(*example.replace("eth1", "lan0").split(), status=None if "conflict" in example else DONE)


def test_a_mistyped_word_gets_a_suggestion():
    for words, meant in (("sbnet list", "subnet"), ("subnet lits", "list"), ("option delete", None), ("vendor sho", "show")):
        text = refused(*words.split(), status=USAGE)
        assert (f"did you mean {meant}?" in text) if meant else ("did you mean" not in text)


def test_on_and_off_switch_the_whole_service():
    server(*SUBNET)
    server("enable", "eth0")
    assert not running()
    server("on")
    assert running() and data("dhcp-server", "status")["service"] is True
    assert (FILES / "dhcpd.info").read_text() == ON
    server("off", "--no-restart")
    assert running() and data("dhcp-server", "status")["service"] is False
    server("off")
    assert not running()
