# box: --link eth0 --link kx12
"""/etc/rc.network: interface files become kernel state."""

import pathlib

import pytest
from conftest import DhcpServer, addresses, is_up, on_other_side, processes, routes, run, wait_for

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")
STATIC = "BOOTPROTO=static\nIPADDR={0}\nNETMASK=255.255.255.0\nONBOOT=yes\n"
ROUTES = "/etc/iproute2/config/static-route4.conf"


@pytest.fixture(autouse=True)
def clean_interfaces(keep):
    for link in ("eth0", "kx12"):
        keep(SCRIPTS / f"ifcfg-{link}")
    keep("/etc/sysconfig/network")
    keep(ROUTES)
    (SCRIPTS / "ifcfg-eth0").unlink()
    yield
    for link in ("eth0", "kx12"):
        run("/sbin/stop", "dhcp-client", f"IFACE={link}")
        run("ip", "addr", "flush", "dev", link)
        run("ip", "link", "set", "dev", link, "down")


def configure(link, text, newline=""):
    with open(SCRIPTS / f"ifcfg-{link}", "w", newline=newline) as file:
        file.write(text)


def network(*words, status=0):
    return run("/etc/rc.network", *words, status=status)


@pytest.mark.parametrize("link", ["eth0", "kx12"])
def test_static_address_reaches_the_other_side(link):
    on_other_side("ip", "addr", "replace", "192.168.77.1/24", "dev", link)
    configure(link, STATIC.format("192.168.77.5"))
    network("start", link)
    assert addresses(link) == ["192.168.77.5/24"]
    assert "brd 192.168.77.255" in run("ip", "-4", "addr", "show", "dev", link).stdout
    assert is_up(link)
    run("ping", "-c", "1", "-W", "5", "192.168.77.1")
    on_other_side("ip", "addr", "flush", "dev", link)


def test_start_replaces_the_address_and_may_be_repeated():
    configure("eth0", STATIC.format("192.168.77.5"))
    network("start", "eth0")
    configure("eth0", STATIC.format("10.9.8.7"))
    for _ in range(2):
        network("start", "eth0")
        assert addresses("eth0") == ["10.9.8.7/24"]


def test_keys_are_read_as_the_platform_reads_them(tmp_path):
    mark = tmp_path / "evaluated"
    configure(
        "eth0",
        f'  BOOTPROTO="dhcp"\n#IPADDR=10.0.0.1\nXIPADDR=10.0.0.2\nBOOTPROTO="static"\r\nIPADDR="192.168.77.6"\n'
        f"IPADDR=10.0.0.3\nNETMASK=255.255.255.0\r\nHOSTNAME=$(touch {mark})`touch {mark}`\ntouch {mark}\n"
        f"BOOTPROTO=none",
    )
    network("start", "eth0")
    assert addresses("eth0") == ["192.168.77.6/24"]
    assert not mark.exists()


def test_last_line_without_newline_is_read():
    configure("eth0", "BOOTPROTO=static\nIPADDR=192.168.77.6\nNETMASK=255.255.0.0")
    network("start", "eth0")
    assert addresses("eth0") == ["192.168.77.6/16"]


@pytest.mark.parametrize(
    ("address", "mask"),
    [
        ("192.168.77", "255.255.255.0"),
        ("192.168.77.256", "255.255.255.0"),
        ("192.168.77.05", "255.255.255.0"),
        ("$(reboot)", "255.255.255.0"),
        ("", "255.255.255.0"),
        ("10.0.0.1", ""),
        ("10.0.0.1", "24"),
        ("10.0.0.1", "255.0.255.0"),
    ],
)
def test_bad_static_address_is_refused(address, mask, system_log):
    configure("eth0", f"BOOTPROTO=static\nIPADDR={address}\nNETMASK={mask}\n")
    done = network("start", "eth0", status=1)
    assert "rc.network: eth0: " in done.stderr
    assert addresses("eth0") == []
    wait_for(lambda: system_log.holds("eth0: "), what="the message in the system log")


def test_bad_address_in_the_file_leaves_the_running_one():
    configure("eth0", STATIC.format("192.168.77.5"))
    network("start", "eth0")
    configure("eth0", STATIC.format("192.168.77.500"))
    network("start", "eth0", status=1)
    assert addresses("eth0") == ["192.168.77.5/24"]


@pytest.mark.parametrize(
    ("gateway", "default"),
    [
        ("192.168.77.1", ["default via 192.168.77.1 dev eth0"]),
        ('"192.168.77.1"', ["default via 192.168.77.1 dev eth0"]),
        ("192.168.78.1", []),
        ("", []),
    ],
)
def test_gateway_in_the_subnet_becomes_the_default_route(gateway, default):
    pathlib.Path("/etc/sysconfig/network").write_text(f"GATEWAY={gateway}\n")
    configure("eth0", STATIC.format("192.168.77.5"))
    network("start", "eth0")
    assert routes("default") == default


def test_gateway_that_is_no_address_is_reported():
    pathlib.Path("/etc/sysconfig/network").write_text("GATEWAY=router\n")
    configure("eth0", STATIC.format("192.168.77.5"))
    assert 'GATEWAY "router" is not an address' in network("start", "eth0", status=1).stderr
    assert addresses("eth0") == ["192.168.77.5/24"]


def test_static_routes_of_the_interface_are_put_back():
    pathlib.Path(ROUTES).write_text("10.20.0.0/16 192.168.77.254 eth0\n10.30.0.0/16 192.168.99.254 kx12\n")
    configure("eth0", STATIC.format("192.168.77.5"))
    for _ in range(2):
        network("start", "eth0")
        assert routes("10.20.0.0/16") == ["10.20.0.0/16 via 192.168.77.254 dev eth0"]
    assert routes("10.30.0.0/16") == []


def test_bootproto_none_is_up_without_an_address():
    run("ip", "addr", "add", "10.1.1.1/24", "dev", "eth0")
    configure("eth0", "BOOTPROTO=none\n")
    network("start", "eth0")
    assert is_up("eth0")
    assert addresses("eth0") == []


def test_unknown_bootproto_is_refused():
    configure("eth0", "BOOTPROTO=bootp\n")
    assert 'BOOTPROTO "bootp"' in network("start", "eth0", status=1).stderr


@pytest.mark.parametrize(("mode", "disabled"), [("off", "1"), ("auto", "0"), ("static", "0"), (None, "0")])
def test_ipv6_switch_follows_the_file(mode, disabled):
    switch = pathlib.Path("/proc/sys/net/ipv6/conf/eth0/disable_ipv6")
    switch.write_text("0" if disabled == "1" else "1")
    configure("eth0", "BOOTPROTO=none\n" + (f"IPV6INIT={mode}\n" if mode else ""))
    network("start", "eth0")
    assert switch.read_text().strip() == disabled


def test_static_ipv6_address_and_router():
    configure("eth0", "BOOTPROTO=none\nIPV6INIT=static\nIPV6ADDR=2001:db8:77::5\nIPV6PREFIXLENG=64\n"
                      "IPV6_DEFAULTGW=2001:db8:77::1\n")  # fmt: skip
    for _ in range(2):
        network("start", "eth0")
        assert "inet6 2001:db8:77::5/64 scope global" in run("ip", "-6", "addr", "show", "dev", "eth0").stdout
        assert "via 2001:db8:77::1 dev eth0" in run("ip", "-6", "route", "show", "default").stdout
        network("stop", "eth0")
        assert "2001:db8" not in run("ip", "-6", "addr", "show", "dev", "eth0").stdout


@pytest.mark.parametrize(("address", "length"), [("", "64"), ("2001:db8::5", ""), ("::1 dev lo", "64"), ("fe80", "64"),
                                                 ("2001:db8::5", "129"), ("2001:db8::5", "64/7")])  # fmt: skip
def test_bad_static_ipv6_address_is_told_and_costs_no_ipv4(address, length):
    configure("eth0", STATIC.format("192.168.77.5") +
              f"IPV6INIT=static\nIPV6ADDR={address}\nIPV6PREFIXLENG={length}\n")  # fmt: skip
    assert f"{address}/{length}" in network("start", "eth0", status=1).stderr
    assert addresses("eth0") == ["192.168.77.5/24"]


def test_stop_takes_addresses_and_link_down():
    configure("eth0", STATIC.format("192.168.77.5"))
    network("start", "eth0")
    network("stop", "eth0")
    assert addresses("eth0") == []
    assert not is_up("eth0")
    network("stop", "eth0")
    network("restart", "eth0")
    assert addresses("eth0") == ["192.168.77.5/24"]
    assert is_up("eth0")


def test_dhcp_and_back_to_static(tmp_path):
    with DhcpServer("kx12", "192.168.60", folder=tmp_path):
        configure("kx12", "BOOTPROTO=dhcp\nONBOOT=yes\n")
        network("start", "kx12")
        leased = wait_for(lambda: addresses("kx12"), what="a lease")[0]
        assert leased.startswith("192.168.60.") and leased.endswith("/24")

        configure("kx12", STATIC.format("192.168.61.5"))
        network("start", "kx12")
        assert addresses("kx12") == ["192.168.61.5/24"]
        assert not processes("dhclient")
        network("stop", "kx12")


def test_stop_ends_the_dhcp_client():
    configure("eth0", "BOOTPROTO=dhcp\nONBOOT=yes\n")
    network("start", "eth0")
    assert wait_for(lambda: processes("/sbin/dhclient"))
    network("stop", "eth0")
    assert not processes("/sbin/dhclient")


def test_without_names_the_interfaces_of_the_boot_are_meant():
    configure("eth0", STATIC.format("192.168.77.5"))
    configure("kx12", STATIC.format("192.168.78.5").replace("yes", "no"))
    network("start")
    assert addresses("eth0") == ["192.168.77.5/24"]
    assert not is_up("kx12")
    run("ip", "link", "set", "dev", "kx12", "up")
    network("stop")
    assert not is_up("eth0")
    assert is_up("kx12")


@pytest.mark.parametrize("copy", ["eth0.tmp1700000000", "eth0.tmp17", "eth0.saved", ".eth0.swp", "eth0~", "eth0.bak"])
def test_copies_are_no_interfaces(copy, keep):
    configure("eth0", STATIC.format("192.168.77.5"))
    keep(SCRIPTS / f"ifcfg-{copy}").write_text(STATIC.format("192.168.78.6"))
    done = network("start")
    assert done.stderr == ""
    assert addresses("eth0") == ["192.168.77.5/24"]


@pytest.mark.parametrize(
    "name", ["", ".", "..", "../ifcfg-eth0", "a b", "-eth0", "eth0\n", "sixteencharacter", "nosuch0"]
)
def test_what_is_no_interface_is_refused_and_the_others_go_on(name, system_log):
    configure("eth0", STATIC.format("192.168.77.5"))
    assert network("start", name, "eth0", status=1).stderr.startswith("rc.network: ")
    assert addresses("eth0") == ["192.168.77.5/24"]
    wait_for(lambda: system_log.holds("rc.network"), what="the message in the system log")


def test_interface_that_is_not_there_is_reported(keep):
    keep(SCRIPTS / "ifcfg-gone0").write_text(STATIC.format("192.168.77.5"))
    assert "gone0: there is no such interface" in network("start", "gone0", status=1).stderr


@pytest.mark.parametrize(
    ("name", "text"), [("bond1", "BONDING_OPTS=\n"), ("ovs_bond0", "SLAVE_LIST=eth0 kx12\nBOND_MODE=balance-slb\n")]
)
@pytest.mark.parametrize("verb", ["start", "stop"])
def test_bond_of_the_virtual_switch_is_refused(name, text, verb, keep, system_log):
    configure("eth0", STATIC.format("192.168.77.5"))
    keep(SCRIPTS / f"ifcfg-{name}").write_text("ONBOOT=yes\n" + text)
    message = f"{name}: this is a bond of the virtual switch, which"
    assert message in network(verb, name, "eth0", status=1).stderr
    assert addresses("eth0") == (["192.168.77.5/24"] if verb == "start" else [])
    wait_for(lambda: system_log.holds(message), what="the message in the system log")


@pytest.mark.parametrize(
    ("name", "text", "message"),
    [
        ("kx12", "MASTER=bond0\nSLAVE=yes\n", 'kx12: no bond or bridge "bond0" to belong to'),
        ("kx12", "BRIDGE=eth0\n", 'kx12: no bond or bridge "eth0" to belong to'),
        ("kx12", "BRIDGE=../eth0\n", 'kx12: no bond or bridge "../eth0" to belong to'),
        ("eth0.10", "VLAN_ROW_DEVICE=gone0\nVLAN_ID=10\n", 'eth0.10: no row device "gone0"'),
        ("eth0.10", "VLAN_ROW_DEVICE=eth0\nVLAN_ID=x\n", 'eth0.10: VLAN_ID "x" is not a VLAN id'),
        ("eth0.10", "VLAN_ROW_DEVICE=eth0\nVLAN_ID=-1\n", 'eth0.10: VLAN_ID "-1" is not a VLAN id'),
        ("eth0.10", "VLAN_ROW_DEVICE=eth0\nVLAN_ID=010\n", 'eth0.10: VLAN_ID "010" is not a VLAN id'),
        ("eth0.10", "VLAN_ROW_DEVICE=eth0\n", 'eth0.10: VLAN_ID "" is not a VLAN id'),
    ],
)
def test_what_cannot_be_made_is_told_and_the_others_go_on(name, text, message, keep, system_log):
    configure("eth0", STATIC.format("192.168.77.5"))
    keep(SCRIPTS / f"ifcfg-{name}").write_text("ONBOOT=yes\n" + text)
    assert message in network("start", status=1).stderr
    assert addresses("eth0") == ["192.168.77.5/24"]
    wait_for(lambda: system_log.holds(message), what="the message in the system log")


@pytest.mark.parametrize("value", ["9000", '"9000"\r'])
def test_stored_mtu_is_set(value, keep):
    info = keep("/etc/kovainfo.conf")
    with open(info, "a", newline="") as file:
        file.write(f"eth0_mtu={value}\n")
    configure("eth0", STATIC.format("192.168.77.5"))
    network("start", "eth0")
    assert pathlib.Path("/sys/class/net/eth0/mtu").read_text() == "9000\n"
    run("ip", "link", "set", "eth0", "mtu", "1500")


@pytest.mark.parametrize("value", ["", "jumbo", "1500 up", "99999999"])
def test_stored_mtu_that_cannot_be_set_is_told_and_costs_no_address(value, keep):
    keep("/etc/kovainfo.conf").write_text(f"eth0_mtu={value}\n")
    configure("eth0", STATIC.format("192.168.77.5"))
    assert f'eth0: cannot set the MTU "{value}"' in network("start", "eth0", status=1).stderr
    assert addresses("eth0") == ["192.168.77.5/24"]


def test_empty_master_is_no_bond_member():
    configure("eth0", STATIC.format("192.168.77.5") + "MASTER=\nSLAVE=\n")
    network("start", "eth0")
    assert addresses("eth0") == ["192.168.77.5/24"]


@pytest.mark.parametrize("words", [[], ["status"], ["nat-stop-dhcp"], ["--help", "eth0"]])
def test_unknown_verb_is_bad_usage(words):
    assert network(*words, status=2).stderr.startswith("usage: rc.network ")


def test_lock_directory_is_made_for_root():
    run("rm", "-rf", "/run/lock/kova")
    run("/etc/rc.network", "start", "lo", status=None)
    made = pathlib.Path("/run/lock/kova").stat()
    assert (made.st_uid, made.st_mode & 0o777) == (0, 0o755)
