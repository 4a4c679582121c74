"""The other side of PPPoE: a server in the network namespace "net", or in another one, and what its sessions look like."""
import contextlib
import ctypes
import os
import pathlib

from conftest import Daemon, keys_of, processes, run, wait_for
from sdk import PppoeConf, library

CONF, SECRETS = pathlib.Path("/etc/ppp/pppoe.conf"), pathlib.Path("/etc/ppp/pap-secrets")
KOVAINFO = pathlib.Path("/etc/kovainfo.conf")
CACHE = pathlib.Path("/tmp/kovapppoe.intf")
RELAY_SETTINGS = pathlib.Path("/etc/sysconfig/pppoe-relay")
SERVER = "10.67.0.1"
USER, PASSWORD = "user1", "a-secret-word"


def apart(namespace, settings_folder, command):
    """
    A command on another side, with settings of its own and a /run of its own: pid files are named after interfaces, of
    which there is a ppp0 on each side.
    """
    script = f"mount -t tmpfs run /run && mkdir /run/pppd /run/lock && mount --bind {settings_folder} /etc/ppp && exec {command}"
    return ["ip", "netns", "exec", namespace, "unshare", "--mount", "sh", "-c", script]


def pppd_word(text):
    """A word as pppd reads it back from a file."""
    return '"' + text.replace("\\", "\\\\").replace('"', '\\"') + '"'


class PppoeServer(Daemon):
    """pppoe-server, with PAP, on an interface of a network namespace; its sessions get addresses from 10.67.0.100 on."""

    def __init__(self, folder, link="eth0", namespace="net", secrets=None):
        settings_folder = folder / "ppp"
        settings_folder.mkdir()
        self.secrets, options = settings_folder / "pap-secrets", folder / "options"
        self.namespace = namespace
        self.know(secrets or {USER: PASSWORD})
        options.write_text(f"require-pap\nms-dns {SERVER}\nlcp-restart 1\nlcp-echo-interval 5\nlcp-echo-failure 3\n")
        run("ip", "-n", namespace, "link", "set", link, "up")
        command = f"pppoe-server -F -I {link} -C concentrator -L {SERVER} -R 10.67.0.100 -O {options}"
        super().__init__(apart(namespace, settings_folder, command), self.listens)

    def know(self, secrets):
        self.secrets.touch(mode=0o600)
        self.secrets.write_text("".join(f"{pppd_word(user)} * {pppd_word(password)} *\n"
                                        for user, password in secrets.items()))  # fmt: skip

    def listens(self):
        """The socket for discovery, 0x8863, is there."""
        return " 8863 " in run("ip", "netns", "exec", self.namespace, "cat", "/proc/net/packet").stdout

    def sessions(self):
        """Pids of the server's own pppd."""
        return processes("pppd pty /usr/sbin/pppoe -n")

    def stop(self):
        super().stop()
        wait_for(lambda: not self.sessions(), what="the end of the server's sessions")


def settings(user=USER, password=PASSWORD, link="eth0", mtu="1400", default_route=False):
    return PppoeConf(szIfname=link.encode(), szUser=user.encode(), szPassword=password.encode(), szMTU=mtu.encode(),
                     blDefaultRoute=default_route)  # fmt: skip


def store(**more):
    assert library.PPPoEConfigSet(ctypes.byref(settings(**more))) == 0


def is_enabled():
    return keys_of(KOVAINFO)["pppoe_enable"].strip('"')


def interface():
    """The interface of the connection, None when there is none."""
    name = ctypes.create_string_buffer(16)
    return name.value.decode() if library.KOVAPPPoeIntfGet(name, 16) == 0 else None


def net_info():
    """Address and mask of the connection, None when there is none."""
    address, mask = ctypes.create_string_buffer(16), ctypes.create_string_buffer(16)
    found = library.KOVAPPPoeNetInfoGet(address, 16, mask, 16)
    return (address.value.decode(), mask.value.decode()) if found == 0 else None


def ppp_interfaces():
    return sorted(path.name for path in pathlib.Path("/sys/class/net").glob("ppp*"))


def clients():
    """Pids of what keeps a connection up, or is one."""
    return processes("/usr/sbin/pppoe-connect") + processes("/usr/sbin/pppd plugin pppoe.so")


def nothing_is_left():
    return not clients() and not ppp_interfaces() and not CACHE.exists() and not pathlib.Path("/run/kova/pppoe").exists()


def relays():
    """Command lines of the relays, behind the program, by their pids; those that are on their way to the background are not
    among them, as they become others."""
    found = {}
    for pid in processes("/usr/sbin/pppoe-relay -C "):
        with contextlib.suppress(OSError):  # gone meanwhile
            if os.readlink(f"/proc/{pid}/cwd") != "/":
                continue
            words = pathlib.Path(f"/proc/{pid}/cmdline").read_bytes().decode().rstrip("\0").split("\0")
            found[pid] = " ".join(words[1:])
    return found


def write_bridge_files(bridges):
    """Files of bridges of the local LAN, each with one port."""
    for bridge, port in bridges.items():
        pathlib.Path(f"/etc/sysconfig/network-scripts/ifcfg-{bridge}").write_text(
            f"DEVICE={bridge}\nTYPE=bridge\nPRIMARY={port}\nLOCAL_LAN=yes\nONBOOT=yes\nBOOTPROTO=none\n")
        pathlib.Path(f"/etc/sysconfig/network-scripts/ifcfg-{port}").write_text(
            f"DEVICE={port}\nBRIDGE={bridge}\nONBOOT=yes\nBOOTPROTO=none\n")
