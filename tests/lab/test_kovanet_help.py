# box: --link eth0 --link lan0
# needs: vlan bonding bridge dummy tun
"""All of kovanet's commands as its help names them: examples at every level, and JSON of every one that reads, documented."""

import json
import re
import shutil
import socket
import subprocess

import pytest
from conftest import DOCUMENT, KOVANET, NO, DhcpServer, documented, kovanet, run, wait_for
from test_kovanet import interface_file

MADE = """
link add row0 type dummy
link set row0 up
link add link row0 name row0.10 type vlan id 10
link set row0.10 up
addr add 10.10.0.1/16 dev row0.10
link add bond7 type bond mode 802.3ad
link add part0 type dummy
link set part0 master bond7
link set bond7 up
link add br7 type bridge
link set br7 up
"""
MADE_LINKS = ("row0", "bond7", "part0", "br7")

# what every command that reads is called with here, and the section of the document that has the fields it prints
READS = {
    "show": ("", "show"), "verify": ("", "verify"), "monitor": ("--count 1", "monitor"),
    "card list": ("", "card list"), "card show": ("eth0", "card list"), "link show": ("", "link show"),
    "addr list": ("", "addr list"), "gateway show": ("", "gateway show"), "stats": ("", "stats"),
    "block show": ("eth0", "block show"), "vlan list": ("", "vlan list"), "vlan show": ("row0.10", "vlan list"),
    "bond list": ("", "bond list"), "bond show": ("bond7", "bond list"), "bridge list": ("", "bridge list"),
    "bridge show": ("br7", "bridge list"), "ipv6 show": ("", "ipv6 show"), "mtu show": ("", "mtu show"),
    "pppoe show": ("", "pppoe show"), "pppoe status": ("", "pppoe status"), "pppoe-relay show": ("br7", "pppoe-relay show"),
    "dns show": ("", "dns show"), "dhcp-server status": ("", "dhcp-server status"),
    "dhcp-server subnet list": ("", "dhcp-server subnet"), "dhcp-server subnet show": ("eth0 0", "dhcp-server subnet"),
    "dhcp-server option list": ("eth0 0", "dhcp-server option list"),
    "dhcp-server vendor list": ("", "dhcp-server vendor list"),
    "dhcp-server vendor show": ("MSFT", "dhcp-server vendor show"), "dhcp-server pxe show": ("", "dhcp-server pxe show"),
    "dhcp-server conflict": ("lan0 10.0.0.1 10.0.0.2 255.0.0.0", "dhcp-server conflict"),
    "dhcp-server test-client": ("lan0", "dhcp-server test-client"),
    "conflict address": ("lan0 10.9.0.77", "conflict address"), "conflict bond": ("bond7", "conflict bond"),
    "lookup": ("127.0.0.1", "lookup"), "ports list": ("tcp", "ports list"), "ports used": ("tcp 1 65535", "ports used"),
    "hostname show": ("", "hostname show"), "topology show": ("", "topology show"), "reach": ("127.0.0.1 PORT", "reach"),
    "tunnel show": ("", "tunnel show"), "check address": ("10.0.0.1", "check"), "check mask": ("255.0.0.0", "check"),
    "check prefix": ("10.0.0.0/8", "check"), "check ipv6": ("2001:db8::1", "check"),
    "check hostname": ("nas01", "check"), "check domain": ("example.com", "check"),
}  # fmt: skip
CHANGES = """
card set; link up; link down; link rename; link watch; addr add; addr del; addr flush; gateway set; gateway clear; route check;
route add; route del; block set; vlan create; vlan remove; bond create; bond change; bond delete; bridge set; ipv6 set;
ipv6 init; mtu set; pppoe set; pppoe start; pppoe stop; pppoe-relay set; pppoe-relay apply; pppoe-relay clear; dns set;
dns mode; dns update; dhcp-server on; dhcp-server off; dhcp-server enable; dhcp-server disable; dhcp-server restart;
dhcp-server subnet set; dhcp-server subnet off; dhcp-server option set; dhcp-server option del; dhcp-server vendor set;
dhcp-server vendor del; dhcp-server pxe set; dhcp-server pxe off; wake; hostname set; service notify; topology set; tunnel set;
tunnel start; tunnel stop; tunnel restart
"""
# fields beside those of the section
MORE = {"check prefix": ["network", "mask"]}
# sections with the fields of a part, each with the command and the field that hold it; "" for a line of a watch
PARTS = {
    "show, each interface": ("show", "interfaces"), "verify, each difference": ("verify", "differences"),
    "dhcp-server status, each interface": ("dhcp-server status", "interfaces"),
    "stats --watch": ("stats --watch 0.1 --count 1", ""),
}


@pytest.fixture(scope="module", autouse=True)
def machine(tmp_path_factory):
    """One of everything that a command can tell of."""
    for name in ("eth0", "lan0"):
        interface_file(name).write_text(f"DEVICE={name}\nONBOOT=yes\nBOOTPROTO=none\n")
        run("ip", "link", "set", name, "up")
    interface_file("part0").write_text("DEVICE=part0\nMASTER=bond7\nSLAVE=yes\n")
    interface_file("bond7").write_text("DEVICE=bond7\nBOOTPROTO=static\nIPADDR=10.7.0.1\nNETMASK=255.0.0.0\n")
    interface_file("gone0").write_text("DEVICE=gone0\nONBOOT=yes\n")
    run("ip", "-batch", "-", input=MADE)
    for words in ("subnet set eth0 0 range 10.1.0.10 10.1.0.20 mask 255.255.0.0 router 10.1.0.1",
                  "option set eth0 0 mtu 1400", "vendor set MSFT 2 1i", "enable eth0"):
        kovanet("dhcp-server", *words.split())
    with DhcpServer("lan0", "10.9.0", folder=tmp_path_factory.mktemp("other")):
        yield
    for name in MADE_LINKS:
        run("ip", "link", "del", name)
    for path in interface_file("").parent.glob("ifcfg-*"):
        path.unlink()
    shutil.rmtree("/etc/dhcpd")


@pytest.fixture(scope="module")
def port():
    with socket.create_server(("127.0.0.1", 0)) as listener:
        yield listener.getsockname()[1]


def helped(*words):
    return kovanet(*words, "--help").stdout


def below(text):
    """The commands that a help names."""
    commands = re.search(r"^Commands:\n((?:  .*\n)+)", text, re.MULTILINE)
    return re.findall(r"^  (\S+)", commands[1], re.MULTILINE) if commands else []


def levels(*words):
    """Every command and its help, from the top down."""
    text = helped(*words)
    yield " ".join(words), text
    for word in below(text):
        yield from levels(*words, word)


@pytest.fixture(scope="module")
def helps():
    return dict(levels())


def test_every_level_of_the_help_has_examples_of_it(helps):
    assert len(helps) > 100
    for words, text in helps.items():
        assert f"Usage: kovanet {words}".rstrip() in text
        examples = re.findall(r"^  (kovanet .+)$", text.partition("\nExamples:\n")[2], re.MULTILINE)
        assert any(f"{example} ".startswith(f"kovanet {words}".rstrip() + " ") for example in examples), words
        assert "Every command takes --json" in text and "5 needs root" in text


def test_every_command_is_known_to_read_or_to_change(helps):
    leaves = {words for words, text in helps.items() if not below(text)}
    assert leaves == READS.keys() | set(re.split(r";\s*", CHANGES.strip()))


def test_every_section_of_the_document_is_a_command_that_is_run_here():
    sections = set(re.findall(r"^## kovanet (.+)$", DOCUMENT.read_text(), re.MULTILINE))
    assert sections == {section for _, section in READS.values()} | PARTS.keys() | {"stats --watch, each interface"}


def printed_by(words):
    """What a command prints with --json, and that it is one line."""
    done = run(KOVANET, *words.split(), "--json", status=None, timeout=300)
    assert done.returncode in (0, NO) and done.stderr == "" and done.stdout.count("\n") == 1, (words, done)
    return json.loads(done.stdout)


def told_by_monitor(words):
    """The monitor tells a change that is made when it looks."""
    with subprocess.Popen([KOVANET, *words.split(), "--json"], stdout=subprocess.PIPE, text=True) as monitor:

        def line_of_a_change():
            run("ip", "link", "set", "row0", "down")
            run("ip", "link", "set", "row0", "up")
            return monitor.poll() is not None

        wait_for(line_of_a_change, 30, "the monitor's end")
        return json.loads(monitor.stdout.read())


@pytest.mark.parametrize("command", READS)
def test_json_of_a_command_has_the_documented_fields(command, port):
    words, section = READS[command]
    tell = told_by_monitor if command == "monitor" else printed_by
    printed = tell(f"{command} {words}".replace("PORT", str(port)))
    rows = printed if isinstance(printed, list) else [printed]
    assert rows
    for row in rows:
        assert sorted(row) == sorted(documented(f"kovanet {section}") + MORE.get(command, []))


@pytest.mark.parametrize("section", PARTS)
def test_json_of_a_part_has_the_documented_fields(section):
    command, field = PARTS[section]
    printed = printed_by(command)
    rows = printed[field] if field else [printed]
    assert rows
    for row in rows:
        assert list(row) == documented(f"kovanet {section}")


def test_json_of_a_change_is_nothing():
    for words in ("link up lan0", "block set lan0 ha off", "dhcp-server disable eth0", "dhcp-server enable eth0"):
        assert kovanet(*words.split(), "--json").stdout == ""


def test_the_version_names_that_of_the_json():
    [number] = re.findall(r"^These shapes have the number (\d+),", DOCUMENT.read_text(), re.MULTILINE)
    assert re.fullmatch(rf"kovanet \d\S*, JSON {number}\n", kovanet("--version").stdout)
