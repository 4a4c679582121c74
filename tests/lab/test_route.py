# box: --link eth0 --link lan0
"""The default gateway and the routes of the interfaces' own subnets on a real kernel, with real routers behind them."""

import ctypes
import json
import pathlib

import pytest
import sdk
from conftest import on_other_side, routes, run, wait_for

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")
NETWORK = pathlib.Path("/etc/sysconfig/network")
LEASE = pathlib.Path("/etc/dhclient/ipv4/dhcpcd-lan0.info")
ROUTER, OTHER_ROUTER, FAR_HOST = "192.168.50.1", "192.168.60.1", "10.77.0.2"
SUBNET = "192.168.50.0/24"
ADD, DELETE = 0, 1
FAILED = (-1, 0x2A00, "net_default_gateway_set")


@pytest.fixture(scope="module", autouse=True)
def far_host():
    """A host behind the neighbour, which routes for both links."""
    run("ip", "netns", "add", "far")
    on_other_side("ip", "link", "add", "far", "type", "veth", "peer", "name", "near", "netns", "far")
    for address, link in (("10.77.0.1/24", "far"), (f"{ROUTER}/24", "eth0"), (f"{OTHER_ROUTER}/24", "lan0")):
        on_other_side("ip", "addr", "add", address, "dev", link)
    on_other_side("ip", "link", "set", "far", "up")
    on_other_side("sh", "-c", "echo 1 >/proc/sys/net/ipv4/ip_forward")
    run("ip", "-n", "far", "addr", "add", f"{FAR_HOST}/24", "dev", "near")
    run("ip", "-n", "far", "link", "set", "near", "up")
    run("ip", "-n", "far", "route", "add", "default", "via", "10.77.0.1")
    yield
    run("ip", "netns", "del", "far")


@pytest.fixture(autouse=True)
def interfaces(keep):
    """Makes a file and an address for each interface; eth0 and lan0 are in the subnets of the two routers."""
    for path in (SCRIPTS / "ifcfg-eth0", SCRIPTS / "ifcfg-lan0", NETWORK, LEASE):
        keep(path)
    LEASE.unlink(missing_ok=True)
    configure("eth0", "192.168.50.10")
    configure("lan0", "192.168.60.10")
    yield
    for name in ("eth0", "lan0"):
        run("ip", "addr", "flush", "dev", name)
        on_other_side("ip", "link", "set", name, "up")


def has_carrier(name):
    """As the kernel tells it, which is a moment after it came or went."""
    return ip("link", "show", "dev", name)[0]["operstate"] == "UP"


def configure(name, address):
    (SCRIPTS / f"ifcfg-{name}").write_text(f"BOOTPROTO=static\nIPADDR={address}\nNETMASK=255.255.255.0\n")
    run("ip", "link", "set", name, "up")
    wait_for(lambda: has_carrier(name), what=f"carrier of {name}")
    run("ip", "addr", "flush", "dev", name)
    run("ip", "addr", "add", f"{address}/24", "dev", name)


@pytest.fixture
def one_subnet():
    """Both interfaces in eth0's subnet, lan0's route before eth0's; only eth0 leads to the neighbour."""
    configure("lan0", "192.168.50.11")
    configure("eth0", "192.168.50.10")
    assert route_devices() == ["lan0", "eth0"]


def ip(*words):
    return json.loads(run("ip", "-j", *words).stdout)


def route_devices(subnet=SUBNET):
    """The interfaces that a subnet's routes lead over, the used one first."""
    return [route["dev"] for route in ip("route", "show", subnet)]


def reported():
    """Gateway and interface as the library reports them, by all of its calls."""
    gateway, name, alone, name_alone = (ctypes.create_string_buffer(b"untouched", 32) for _ in range(4))
    assert sdk.library.DefaultGatewayGet(gateway, 32, name, 32) == 0
    assert sdk.library.KOVANetDefaultGatewayGet(alone, 32) == 0
    assert sdk.library.KOVANetDefaultGatewayInterfaceGet(name_alone, 32) == 0
    assert (gateway.value, name.value) == (alone.value, name_alone.value)
    return gateway.value.decode(), name.value.decode()


def used():
    """The same as the kernel tells iproute2; a route without a gateway does not count."""
    best = sorted((one for one in ip("route", "show", "default") if "gateway" in one), key=lambda one: one.get("metric", 0))
    return (best[0]["gateway"], best[0]["dev"]) if best else ("untouched", "untouched")


def set_gateway(address):
    result = sdk.library.KOVANetDefaultGatewaySet(address.encode() if address is not None else None)
    return 0 if result == 0 else (result, *sdk.register())


def reaches(address):
    return run("ping", "-c", "1", "-W", "5", address, status=None).returncode == 0


# ---- default gateway ------------------------------------------------------------------------------------------------


def test_default_route_is_set_replaced_used_and_cleared():
    assert reported() == used() == ("untouched", "untouched")
    assert not reaches(FAR_HOST)
    for router, link in ((OTHER_ROUTER, "lan0"), (ROUTER, "eth0")):
        assert set_gateway(router) == 0
        assert reported() == used() == (router, link)
        assert routes("default") == [f"default via {router} dev {link}"]
        assert ip("route", "get", FAR_HOST)[0]["dev"] == link
        assert reaches(FAR_HOST)
    assert set_gateway("") == 0
    assert reported() == used() == ("untouched", "untouched")
    assert routes("default") == [] and not reaches(FAR_HOST)
    assert set_gateway(None) == 0, "nothing to remove is no failure"


@pytest.mark.parametrize("address", ["192.168.51.1", "10.77.0.1", "no.such.host.", "256.1.1.1", "fe80::1", " ",
                                     "x" * 63, "x" * 64, "x" * 4096], ids=lambda text: text[:16])  # fmt: skip
def test_gateway_that_cannot_be_used_is_a_failure(address, system_log):
    assert set_gateway(address) == FAILED
    wait_for(lambda: system_log.holds(f"failed to set default gateway {address[:60].strip()}"), what="the log line")
    assert routes("default") == []


def test_of_several_default_routes_the_lowest_metric_is_reported():
    run("ip", "route", "add", "default", "via", ROUTER, "metric", "200")
    assert reported() == used() == (ROUTER, "eth0")
    run("ip", "route", "add", "default", "via", OTHER_ROUTER, "metric", "100")
    assert reported() == used() == (OTHER_ROUTER, "lan0")
    run("ip", "route", "del", "default", "via", OTHER_ROUTER)
    assert reported() == used() == (ROUTER, "eth0")


def test_largest_metric_is_read():
    run("ip", "route", "add", "default", "via", ROUTER, "metric", str(2**32 - 1))
    assert reported() == used() == (ROUTER, "eth0")


def test_route_over_several_routers_is_reported_with_the_first():
    run("ip", "route", "add", "default", "nexthop", "via", OTHER_ROUTER, "nexthop", "via", ROUTER)
    [route] = ip("route", "show", "default")
    assert reported() == (route["nexthops"][0]["gateway"], route["nexthops"][0]["dev"]) == (OTHER_ROUTER, "lan0")


@pytest.mark.parametrize("route", ["default dev lan0", "unreachable default", "blackhole default",
                                   f"0.0.0.0/1 via {ROUTER}"])  # fmt: skip
def test_route_that_is_no_default_gateway_is_not_reported(route):
    run("ip", "route", "add", *route.split())
    assert reported() == used() == ("untouched", "untouched")
    run("ip", "route", "add", "default", "via", ROUTER, "metric", "5")
    assert reported() == (ROUTER, "eth0")
    run("ip", "route", "del", *route.split())


def test_interface_that_goes_down_takes_the_route_along():
    assert set_gateway(ROUTER) == 0
    run("ip", "link", "set", "eth0", "down")
    assert reported() == used() == ("untouched", "untouched")


def test_routing_table_of_thousands_is_read_to_its_end(tmp_path):
    batch = tmp_path / "batch"
    batch.write_text("".join(f"route add 10.{i // 256}.{i % 256}.0/24 via {ROUTER}\n" for i in range(4000)))
    run("ip", "-batch", batch)
    assert reported() == ("untouched", "untouched")
    run("ip", "route", "add", "default", "via", ROUTER, "metric", "1")
    assert reported() == used() == (ROUTER, "eth0")


def test_configured_gateway_is_used_at_the_next_start():
    NETWORK.write_text("# kept\nHOSTNAME=nas\n")
    assert sdk.library.KOVANetDefaultGatewaySetConf(ROUTER.encode()) == 0
    assert NETWORK.read_text() == f"# kept\nHOSTNAME=nas\nGATEWAY={ROUTER}\n"
    assert routes("default") == [], "the kernel is left alone"
    run("/etc/rc.network", "start", "eth0", "lan0")
    assert reported() == used() == (ROUTER, "eth0")
    assert reaches(FAR_HOST)
    assert sdk.library.KOVANetDefaultGatewaySetConf(b"") == 0
    assert NETWORK.read_text() == "# kept\nHOSTNAME=nas\n"


# ---- subnet routes --------------------------------------------------------------------------------------------------


def handle(action, name):
    return sdk.library.NetRoutetableHandler(action, name.encode())


def test_routes_of_two_interfaces_in_one_subnet_are_cleared_and_added(one_subnet):
    assert handle(DELETE, "lan0") == 0
    assert route_devices() == ["eth0"]
    assert reaches(ROUTER)
    assert handle(ADD, "lan0") == 0
    assert route_devices() == ["lan0", "eth0"]
    assert handle(DELETE, "eth0") == 0
    assert route_devices() == ["lan0"]
    assert handle(ADD, "eth0") == 0
    assert route_devices() == ["eth0", "lan0"]
    assert reaches(ROUTER)
    for name in ("eth0", "lan0"):
        assert handle(DELETE, name) == 0
    assert route_devices() == []


def test_route_of_a_single_interface_has_its_source_address():
    for _ in range(2):  # an old route makes no difference
        assert handle(ADD, "eth0") == 0
        assert routes(SUBNET) == [f"{SUBNET} dev eth0 scope link src 192.168.50.10"]
    assert handle(DELETE, "eth0") == 0
    assert routes(SUBNET) == []
    assert handle(DELETE, "eth0") == 0, "a route that is gone is deleted"


def test_second_tool_adds_what_the_first_refuses(one_subnet, system_log):
    assert handle(DELETE, "lan0") == 0
    assert handle(ADD, "lan0") == 0
    text = "net_routetable_edit:%d lan0 ip route add failed, might be the same subnet, instead of route"
    wait_for(lambda: any(text.split("%d")[1] in one and "net_routetable_edit:" in one for one in system_log.messages),
             what="the log line")
    assert routes(SUBNET)[0] == f"{SUBNET} dev lan0 scope link"


def edit(action, address, mask, name="lan0"):
    return sdk.library.NetRoutetableEdit(action, address.encode(), mask.encode(), name.encode())


@pytest.mark.parametrize("mask", ["255.255.255.0", "255.0.255.0", "0.0.0.0", "255.255.255.255"])
def test_edit_succeeds_whatever_the_tools_make_of_it(mask):
    before = run("ip", "route").stdout
    for name in ("nosuch0", "n" * 63, "n" * 64, "-x"):
        for action in (DELETE, ADD, DELETE):
            assert edit(action, "172.16.5.6", mask, name) == 0
    assert run("ip", "route").stdout == before


@pytest.mark.parametrize("address,mask,name", [("172.16.5.6", "24", "lan0"), ("router", "255.255.0.0", "lan0"),
                                               ("172.16.5.6", "255.255.0.0", "../lan0"), ("", "255.255.0.0", "lan0"),
                                               ("172.16.5.6", "255.255.0.0", "n" * 4096)],
                         ids=["mask", "address", "path", "empty", "long name"])  # fmt: skip
def test_edit_refuses_what_names_no_route(address, mask, name):
    before = run("ip", "route").stdout
    for action in (ADD, DELETE):
        assert edit(action, address, mask, name) == -1
    assert run("ip", "route").stdout == before


def test_leased_address_loses_its_route_and_never_gets_one(one_subnet):
    (SCRIPTS / "ifcfg-lan0").write_text("BOOTPROTO=dhcp\n")
    for action in (ADD, DELETE):
        assert handle(action, "lan0") == -1, "no lease"
    assert route_devices() == ["lan0", "eth0"]
    LEASE.parent.mkdir(parents=True, exist_ok=True)
    LEASE.write_text("IPADDR=192.168.50.11\nNETMASK=255.255.255.0\n")
    assert handle(DELETE, "lan0") == 0
    assert route_devices() == ["eth0"]
    assert handle(ADD, "lan0") == 0
    assert route_devices() == ["eth0"]


def test_member_of_a_bridge_and_other_interfaces_are_left_alone(one_subnet):
    run("ip", "link", "add", "br0", "type", "bridge")
    try:
        run("ip", "link", "set", "lan0", "master", "br0")
        for name in ("lan0", "lo", "nosuch0", "n" * 63, "n" * 64):
            for action in (ADD, DELETE):
                assert handle(action, name) == 0
        assert handle(DELETE, "n" * 4096) == -1 and sdk.register() == (0xD00, "net_routetable_handler")
        assert route_devices() == ["lan0", "eth0"]
    finally:
        run("ip", "link", "del", "br0")


def test_interface_without_a_file_is_a_failure(one_subnet):
    (SCRIPTS / "ifcfg-lan0").unlink()
    assert handle(DELETE, "lan0") == -1
    (SCRIPTS / "ifcfg-lan0").write_bytes(b"\xff\x00IPADDR\nIPADDR\n=\n")
    assert handle(DELETE, "lan0") == -1
    assert route_devices() == ["lan0", "eth0"]


def test_check_clears_the_route_over_a_dead_link(one_subnet):
    on_other_side("ip", "link", "set", "lan0", "down")
    wait_for(lambda: not has_carrier("lan0"), what="the loss of carrier")
    assert ip("route", "get", ROUTER)[0]["dev"] == "lan0"
    assert sdk.library.NetRoutetableCheck() == 0
    assert route_devices() == ["eth0"]
    assert reaches(ROUTER)
    on_other_side("ip", "link", "set", "lan0", "up")
    wait_for(lambda: has_carrier("lan0"), what="carrier")
    assert sdk.library.NetRoutetableCheck() == 0
    assert route_devices() == ["eth0"], "it only clears"


def test_check_leaves_a_single_interface_alone():
    run("ip", "link", "set", "eth0", "down")
    on_other_side("ip", "link", "set", "lan0", "down")
    wait_for(lambda: not has_carrier("lan0"), what="the loss of carrier")
    wait_for(lambda: any("linkdown" in route for route in routes()), what="the mark of the route")
    before = routes()
    assert before and sdk.library.NetRoutetableCheck() == 0
    assert routes() == before


def test_check_without_interfaces_is_a_failure():
    for name in ("eth0", "lan0"):
        run("ip", "link", "set", name, "down")
    assert sdk.library.NetRoutetableCheck() == -1


def test_check_ends_at_an_interface_whose_address_is_not_to_be_had(one_subnet):
    """A file that says nothing, and a lease that is not there."""
    on_other_side("ip", "link", "set", "lan0", "down")
    wait_for(lambda: not has_carrier("lan0"), what="the loss of carrier")
    for text in ("", "BOOTPROTO=static\n", "BOOTPROTO=dhcp\n"):
        (SCRIPTS / "ifcfg-lan0").write_text(text)
        assert sdk.library.NetRoutetableCheck() == -1
    assert route_devices() == ["lan0", "eth0"]
