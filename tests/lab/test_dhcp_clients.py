# box: --link eth0 --link kx12
"""What IPv4 clients of two makes are given is what the library was told to hand out."""

import ctypes
import ipaddress
import struct

import pytest
from conftest import wait_for
from dhcp_lab import clean_server, dhclient, fix_lease, serve, udhcpc
from sdk import DhcpPxeConf, library, string_map

# number, name, kind, dhclient's name
OPTIONS = [
    (7, "log-server", "addresses", "log-servers"),
    (9, "lpr-server", "addresses", "lpr-servers"),
    (13, "boot-file-size", "16 bits", "boot-size"),
    (16, "swap-server", "address", "swap-server"),
    (17, "root-path", "text", "root-path"),
    (18, "extension-path", "text", "extensions-path"),
    (19, "ip-forward-enable", "flag", "ip-forwarding"),
    (20, "non-local-source-routing", "flag", "non-local-source-routing"),
    (21, "policy-filter", "addresses", "policy-filter"),
    (22, "max-datagram-reassembly", "16 bits", "max-dgram-reassembly"),
    (23, "default-ttl", "8 bits", "default-ip-ttl"),
    (26, "mtu", "16 bits", "interface-mtu"),
    (27, "all-subnets-local", "flag", "all-subnets-local"),
    (31, "router-discovery", "flag", "router-discovery"),
    (32, "router-solicitation", "address", "router-solicitation-address"),
    (34, "trailer-encapsulation", "flag", "trailer-encapsulation"),
    (35, "arp-timeout", "32 bits", "arp-cache-timeout"),
    (36, "ethernet-encap", "flag", "ieee802-3-encapsulation"),
    (37, "tcp-ttl", "8 bits", "default-tcp-ttl"),
    (38, "tcp-keepalive", "32 bits", "tcp-keepalive-interval"),
    (40, "nis-domain", "text", "nis-domain"),
    (41, "nis-server", "addresses", "nis-servers"),
    (42, "ntp-server", "addresses", "ntp-servers"),
    (44, "netbios-ns", "addresses", "netbios-name-servers"),
    (45, "netbios-dd", "addresses", "netbios-dd-server"),
    (46, "netbios-nodetype", "8 bits", "netbios-node-type"),
    (47, "netbios-scope", "text", "netbios-scope"),
    (48, "x-windows-fs", "addresses", "font-servers"),
    (49, "x-windows-dm", "addresses", "x-display-manager"),
    (58, "T1", "32 bits", "dhcp-renewal-time"),
    (59, "T2", "32 bits", "dhcp-rebinding-time"),
    (64, "nis+-domain", "text", "nisplus-domain"),
    (65, "nis+-server", "addresses", "nisplus-servers"),
    (68, "mobile-ip-home", "addresses", "mobile-ip-home-agent"),
    (69, "smtp-server", "addresses", "smtp-server"),
    (70, "pop3-server", "addresses", "pop-server"),
    (71, "nntp-server", "addresses", "nntp-server"),
    (74, "irc-server", "addresses", "irc-server"),
    (120, "sip-server", "addresses", "sip"),
    (121, "classless-static-route", "routes", "routes-more"),
]
# those that busybox's client shows by a name of its own, as the fragment says them but for blanks between items; it
# shows all others by their bytes
BUSYBOX_NAMES = {9: "lprsrv", 13: "bootsize", 16: "swapsrv", 17: "rootpath", 23: "ipttl", 26: "mtu", 40: "nisdomain",
                 41: "nissrv", 42: "ntpsrv", 44: "wins", 120: "sipsrv", 121: "staticroutes"}  # fmt: skip
ROUTES = ["10.21.0.0/16", "192.168.60.2", "172.16.0.0/12", "192.168.60.3"]
USUAL = {
    **{number: str(1000 + number) for number in (13, 22, 26, 35, 38, 58, 59)},
    **{number: str(number) for number in (23, 37)},
    **{number: "1" for number in (19, 20, 27, 31, 34, 36)},
    **{number: f"value{number}.example" for number in (17, 18, 40, 47, 64)},
    16: "10.16.0.1", 32: "10.32.0.1", 46: "8", 21: ["10.21.0.0", "255.255.0.0", "10.22.1.0", "255.255.255.0"],
    121: ROUTES,
}  # fmt: skip
HIGHEST = {
    **{number: "65535" for number in (13, 22, 26)},
    **{number: "4294967295" for number in (35, 38)},
    58: "3598", 59: "3599",  # of a lease of 3600 seconds
    **{number: "255" for number in (23, 37)},
    **{number: "1" for number in (19, 20, 27, 31, 34, 36)},
    16: "223.255.255.254", 32: "223.255.255.254", 46: "8", 21: ["223.255.255.252", "255.255.255.252"],
    121: ["223.255.255.254/32", "223.255.255.254"],
    # what the server would take for an address, a number, bytes, or a remark
    17: "192.168.60.9", 18: "fe80::1", 40: "1234", 47: "0a:0b:0c", 64: " # \"two words\" \\t'x' 1i",
}  # fmt: skip
LOWEST = {
    13: "0", 22: "576", 26: "68", 35: "0", 38: "0", 58: "3", 59: "4", 23: "1", 37: "1",
    **{number: "0" for number in (19, 20, 27, 31, 34, 36)},
    **{number: "x" for number in (17, 18, 40, 47, 64)},
    16: "1.0.0.1", 32: "1.0.0.1", 46: "1", 21: ["10.0.0.0", "255.0.0.0"], 121: ["10.0.0.0/8", "192.168.60.1"],
}  # fmt: skip


def values_of(round_of_values):
    """The value of every option; a list of two addresses where nothing is said."""
    return {number: round_of_values.get(number, [f"10.{number}.0.1", f"10.{number}.0.254"])
            for number, *_ in OPTIONS}  # fmt: skip


def packed(address):
    return ipaddress.IPv4Address(address).packed


def route_bytes(network, router):
    """Only as many bytes of the network as its prefix covers."""
    net = ipaddress.IPv4Network(network)
    return bytes([net.prefixlen]) + net.network_address.packed[: (net.prefixlen + 7) // 8] + packed(router)


def on_the_wire(number, kind, value):
    """An option's bytes."""
    match kind:
        case "flag" | "8 bits":
            return bytes([int(value)])
        case "16 bits":
            return struct.pack(">H", int(value))
        case "32 bits":
            return struct.pack(">I", int(value))
        case "text":
            return value.encode()
        case "address":
            return packed(value)
        case "addresses":
            # the SIP servers say first that they are addresses and not names
            return (b"\1" if number == 120 else b"") + b"".join(map(packed, value))
        case "routes":
            return b"".join(map(route_bytes, value[::2], value[1::2]))


@pytest.fixture(autouse=True)
def server():
    with clean_server("eth0", "kx12"):
        yield


def write_all_options(values):
    serve("eth0", "192.168.60", options=[(number, name, values[number]) for number, name, *_ in OPTIONS])
    assert library.DHCPServerStart() == 0


@pytest.mark.parametrize("chosen", [USUAL, HIGHEST, LOWEST], ids=["usual", "highest", "lowest"])
def test_every_option_reaches_busybox_byte_for_byte(tmp_path, chosen):
    values = values_of(chosen)
    write_all_options(values)
    told = udhcpc("eth0", tmp_path, "-o", requests=[number for number, *_ in OPTIONS])
    expected = {}
    for number, _, kind, _ in OPTIONS:
        if number in BUSYBOX_NAMES:
            value = values[number]
            expected[BUSYBOX_NAMES[number]] = value if isinstance(value, str) else " ".join(value)
        else:
            expected[f"opt{number}"] = on_the_wire(number, kind, values[number]).hex()
    assert {name: told.get(name) for name in expected} == expected


def shown_by_dhclient(number, kind, value):
    if kind == "routes" or number == 120:  # not known to it: shown as bytes
        return ":".join(f"{byte:x}" for byte in on_the_wire(number, kind, value))
    if kind == "flag":
        return "true" if value == "1" else "false"
    return value if isinstance(value, str) else " ".join(value)


def test_every_option_reaches_dhclient(tmp_path):
    values = values_of(USUAL)
    write_all_options(values)
    told = dhclient("eth0", tmp_path, "send dhcp-max-message-size 1500", "option sip code 120 = string",
                    "option routes-more code 121 = string", request=[known for *_, known in OPTIONS])  # fmt: skip
    expected = {known.replace("-", "_"): shown_by_dhclient(number, kind, values[number])
                for number, _, kind, known in OPTIONS}  # fmt: skip
    assert {name: told.get(name) for name in expected} == expected


def test_both_makes_are_given_the_subnet(tmp_path):
    serve("eth0", "192.168.60", first=77, last=77, dns_more="10.9.9.1,10.9.9.2", lease_time=1234)
    assert library.DHCPServerStart() == 0
    names = ("subnet-mask", "routers", "domain-name-servers", "domain-search", "domain-name")
    lease = dhclient("eth0", tmp_path, request=names)
    assert lease["ip_address"] == "192.168.60.77"
    assert lease["subnet_mask"] == "255.255.255.0"
    assert lease["routers"] == "192.168.60.1"
    assert lease["domain_name_servers"] == "192.168.60.53 192.168.60.54 10.9.9.1 10.9.9.2"
    assert lease["domain_search"].rstrip(".") == lease["domain_name"] == "lab.example"
    assert lease["dhcp_lease_time"] == "1234"
    told = udhcpc("eth0", tmp_path, "-C", requests=[119])
    assert (told["ip"], told["subnet"], told["router"]) == ("192.168.60.77", "255.255.255.0", "192.168.60.1")
    assert told["dns"] == "192.168.60.53 192.168.60.54 10.9.9.1 10.9.9.2"
    assert (told["search"], told["domain"], told["lease"]) == ("lab.example", "lab.example", "1234")


def test_subnet_without_router_sends_clients_to_none(tmp_path):
    serve("eth0", "192.168.60", router="")
    assert library.DHCPServerStart() == 0
    told = udhcpc("eth0", tmp_path)
    assert told["dns"] == "192.168.60.53 192.168.60.54"
    assert "router" not in told


def test_values_that_fit_into_no_option_are_left_out_and_logged(tmp_path, system_log):
    unfit = {13: "65536", 22: "65536", 26: "65536", 35: "4294967296", 38: "18446744073709551615", 58: "2", 59: "3600",
             17: "x" * 256, 7: ["10.0.0.1"] * 64}  # fmt: skip
    names = {number: name for number, name, *_ in OPTIONS}
    serve("eth0", "192.168.60", options=[*[(number, names[number], value) for number, value in unfit.items()],
                                         (18, names[18], "x" * 255), (23, names[23], "64")])  # fmt: skip
    assert library.DHCPServerStart() == 0
    told = udhcpc("eth0", tmp_path, requests=[*unfit, 18, 23])
    assert (told["ipttl"], told["opt18"], told["router"]) == ("64", b"x".hex() * 255, "192.168.60.1")
    assert (told["opt58"], told["opt59"]) == (f"{3600 // 2:08x}", f"{3600 * 7 // 8:08x}")
    assert not {"bootsize", "opt22", "mtu", "opt35", "opt38", "rootpath", "opt7"} & set(told)
    for number in unfit:
        wait_for(lambda name=names[number]: system_log.holds(f'left out "dhcp-option=tag:eth00,option:{name},'))


def options_in(shown):
    """The options inside the option of a vendor class, by their numbers."""
    rest, found = bytes.fromhex(shown), {}
    while rest and rest[0] != 255:
        number, length = rest[0], rest[1]
        assert number not in found
        found[number], rest = rest[2 : 2 + length], rest[2 + length :]
    return found


def test_options_of_a_vendor_class_go_to_its_clients_only(tmp_path):
    serve("eth0", "192.168.60")
    assert library.DHCPVendorSetVendor(b"MSFT", string_map({"1": "2i", "3": "hello"})) == 0
    assert library.DHCPVendorSetVendorOpt(b"other", 7, b"10.7.7.7") == 0
    assert library.DHCPServerStart() == 0
    vendor = udhcpc("eth0", tmp_path, "-V", "MSFT 5.0", requests=[43])
    assert options_in(vendor["opt43"]) == {1: b"\0\0\0\2", 3: b"hello"}
    assert options_in(udhcpc("eth0", tmp_path, "-V", "other", requests=[43])["opt43"]) == {7: packed("10.7.7.7")}
    plain = udhcpc("eth0", tmp_path, requests=[43])
    assert plain["ip"] == vendor["ip"] and "opt43" not in plain
    told = dhclient("eth0", tmp_path, 'send vendor-class-identifier "MSFT 98"', request=["vendor-encapsulated-options"])
    shown = "".join(f"{int(byte, 16):02x}" for byte in told["vendor_encapsulated_options"].split(":"))
    assert options_in(shown) == {1: b"\0\0\0\2", 3: b"hello"}


PXE_CLIENT = "PXEClient:Arch:00000:UNDI:002001"


def set_pxe(**fields):
    conf = DhcpPxeConf(**fields)
    assert library.DHCPPXEConfSet(ctypes.byref(conf)) == 0
    assert library.DHCPServerRestart() == 0


def test_clients_that_boot_from_the_network_are_told_the_local_file(tmp_path):
    serve("eth0", "192.168.60")
    set_pxe(enabled=1, local_bootloader=b"boot/pxelinux.0")
    told = udhcpc("eth0", tmp_path, "-V", PXE_CLIENT)
    assert (told["boot_file"], told["siaddr"], told["router"]) == ("boot/pxelinux.0", "192.168.60.1", "192.168.60.1")
    told = dhclient("eth0", tmp_path, f'send vendor-class-identifier "{PXE_CLIENT}"')
    assert (told["filename"], told["next_server"]) == ("boot/pxelinux.0", "192.168.60.1")
    assert "boot_file" not in udhcpc("eth0", tmp_path)
    set_pxe(enabled=0)
    assert "boot_file" not in udhcpc("eth0", tmp_path, "-V", PXE_CLIENT)


@pytest.mark.parametrize("name", ["boot files #1/ pxe.0", "\\x64\\new\\tools.com"], ids=["remark", "backslashes"])
def test_name_of_the_boot_file_is_given_as_it_is(tmp_path, name):
    serve("eth0", "192.168.60")
    fix_lease("eth0", "eth0", "192.168.60.99")
    set_pxe(enabled=1, is_remote_tftp=1, remote_bootloader=name.encode(), remote_tftp_server_ip=b"192.168.60.99")
    told = udhcpc("eth0", tmp_path, "-V", PXE_CLIENT)
    assert (told["boot_file"], told["siaddr"]) == (name, "192.168.60.99")


def test_clients_that_boot_from_the_network_are_told_the_other_server(tmp_path):
    serve("eth0", "192.168.60")
    set_pxe(enabled=1, is_remote_tftp=1, remote_bootloader=b"efi.img", remote_tftp_server_ip=b"192.168.60.99")
    told = udhcpc("eth0", tmp_path, "-V", PXE_CLIENT)
    assert (told["boot_file"], told["siaddr"], told["sname"]) == ("efi.img", "192.168.60.99", "bootserver")
    told = udhcpc("eth0", tmp_path)
    assert "boot_file" not in told and "sname" not in told
