# box: --link lan0
"""kovanetdtool puts the administrator's routes into the kernel."""

import pathlib

import pytest
from conftest import routes, run

ROUTES = "/etc/iproute2/config/static-route4.conf"
TOOL = "/usr/kova/sbin/kovanetdtool"


@pytest.fixture(autouse=True)
def lan(keep):
    keep(ROUTES)
    run("ip", "addr", "replace", "192.168.70.2/24", "dev", "lan0")
    run("ip", "link", "set", "dev", "lan0", "up")
    yield
    run("ip", "addr", "flush", "dev", "lan0")


def refresh(*more, status=0):
    return run(TOOL, "--refresh-static-route-rules", "-4", *more, status=status)


def test_routes_are_set_and_set_again():
    pathlib.Path(ROUTES).write_text("# routes\n\n10.1.0.0/16 192.168.70.254 lan0\n10.2.3.4/32\t192.168.70.253  lan0")
    for gateway in ("192.168.70.254", "192.168.70.252"):
        pathlib.Path(ROUTES).write_text(pathlib.Path(ROUTES).read_text().replace("192.168.70.254", gateway))
        refresh()
        assert routes("10.1.0.0/16") == [f"10.1.0.0/16 via {gateway} dev lan0"]
        assert routes("10.2.3.4/32") == ["10.2.3.4 via 192.168.70.253 dev lan0"]
    run("ip", "addr", "flush", "dev", "lan0")
    run("ip", "addr", "add", "192.168.70.2/24", "dev", "lan0")
    assert routes("10.1.0.0/16") == []
    refresh()
    assert routes("10.1.0.0/16")


def test_no_routes_is_success():
    refresh()
    pathlib.Path(ROUTES).unlink()
    refresh()


@pytest.mark.parametrize(
    "line",
    [
        "10.1.0.0 192.168.70.254 lan0",
        "10.1.0.0/33 192.168.70.254 lan0",
        "10.1.0.0/ 192.168.70.254 lan0",
        "10.1.0.1/16 192.168.70.254 lan0",
        "default 192.168.70.254 lan0",
        "10.1.0.0/16 router lan0",
        "10.1.0.0/16 192.168.71.254 lan0",
        "10.1.0.0/16 192.168.70.254",
        "10.1.0.0/16 192.168.70.254 ../lan0",
        "10.1.0.0/16 192.168.70.254 nosuch0",
        "10.1.0.0/16 192.168.70.254 lan0 metric 5",
        "* * *",
    ],
)
def test_bad_line_is_reported_and_the_others_go_in(line):
    pathlib.Path(ROUTES).write_text(f"{line}\n10.2.0.0/16 192.168.70.254 lan0\n")
    assert refresh(status=1).stderr.startswith("kovanetdtool: ")
    assert routes("10.2.0.0/16") == ["10.2.0.0/16 via 192.168.70.254 dev lan0"]
    assert routes("10.1.0.0/16") == []


def test_routes_of_one_interface():
    pathlib.Path(ROUTES).write_text("10.1.0.0/16 192.168.70.254 nosuch0\n10.2.0.0/16 192.168.70.254 lan0\n")
    refresh("lan0")
    assert routes("10.2.0.0/16")


@pytest.mark.parametrize(
    "words",
    [[], ["--refresh-static-route-rules"], ["--refresh-static-route-rules", "-6"], ["-4"], ["--other", "-4"],
     ["--refresh-static-route-rules", "-4", "lan0", "more"]],
)  # fmt: skip
def test_unknown_options_are_bad_usage(words):
    assert run(TOOL, *words, status=2).stderr.startswith("usage: kovanetdtool ")
