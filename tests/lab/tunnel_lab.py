"""The IPv6 tunnel: its files, an account, and a broker on the other side."""

import ctypes
import json
import pathlib
import re
import sys

from conftest import OTHER_SIDE, Daemon, on_other_side, run

GOGOC = pathlib.Path("/etc/gogoc")
CONF, PASSWORD = GOGOC / "gogoc.conf", GOGOC / ".tunnel_passwd"
ACCOUNT = pathlib.Path("/etc/sysconfig/network-scripts/ifcfg-tun")
RUN_KEY = pathlib.Path("/etc/kova/service/kovatunnel.conf")
CLIENT = "/usr/bin/gogoc"
BROKER = pathlib.Path(__file__).with_name("tunnel_broker.py")
SERVER, SECRET = "192.168.50.1", "se cr*t'\"€"
NEAR, FAR = "2001:db8:7::2", "2001:db8:7::1"


class TunnelConf(ctypes.Structure):
    _fields_ = [("blAnonymous", ctypes.c_uint8), ("szServer", ctypes.c_char * 256), ("szUserId", ctypes.c_char * 256),
                ("szPassword", ctypes.c_char * 32)]


class LabBroker(Daemon):
    """A broker on the other side, which a test tells how to be."""

    def __init__(self, folder, port=3653, **more):
        self.file, self.log = folder / f"broker-{port}.json", folder / f"broker-{port}.log"
        self.settings = {"listen": [SERVER, port], "prefix": "2001:db8:7", "accounts": {"alice": SECRET}, "anonymous": True,
                         "mode": "serve", "delay": 0, "others": [], "log": str(self.log), **more}
        self.be()
        super().__init__([*OTHER_SIDE, sys.executable, BROKER, self.file], lambda: self.said("ready"))

    def be(self, **settings):
        self.settings.update(settings)
        new = self.file.with_suffix(".new")
        new.write_text(json.dumps(self.settings))
        new.rename(self.file)

    def said(self, text):
        return self.log.exists() and text in self.log.read_text()


def account(user="alice", password=SECRET, server=SERVER):
    return TunnelConf(0, server.encode(), user.encode(), password.encode())


def anonymous(server=SERVER):
    return TunnelConf(1, server.encode(), b"", b"")


def addresses():
    """The tunnel's addresses; nothing without a tunnel."""
    shown = run("ip", "-6", "-o", "addr", "show", "dev", "tun", "scope", "global", status=None).stdout
    return re.findall(r"inet6 (\S+)", shown)


def expect_tunnel():
    """Packets cross, both ways and of every size that fits."""
    assert addresses() == [f"{NEAR}/64"]
    run("ping", "-6", "-c", "2", "-i", "0.2", "-W", "10", FAR)
    run("ping", "-6", "-c", "1", "-W", "10", "-s", "1232", FAR)
    on_other_side("ping", "-6", "-c", "2", "-i", "0.2", "-W", "10", NEAR)
