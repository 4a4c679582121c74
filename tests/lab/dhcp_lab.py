"""The appliance as a DHCP server: its files and switches, and real clients of two makes on the other side."""

import contextlib
import ctypes
import pathlib
import shutil
import signal

from conftest import OTHER_SIDE, Daemon, on_other_side, processes, run, wait_for
from sdk import dhcp_subnet, library

CLIENT = "/usr/kova/sbin/dhclient"
SERVER = "dnsmasq --conf-file=/run/kova/dhcp-server/dnsmasq.conf"
FILES = pathlib.Path("/etc/dhcpd")
SERVED = pathlib.Path("/run/kova/dhcp-server/dnsmasq.conf")
LEASES = pathlib.Path("/var/lib/kova/dhcp-server.leases")
PID = pathlib.Path("/run/kova/dhcp-server/dnsmasq.pid")
V4, V6 = 0, 1


@contextlib.contextmanager
def clean_server(*links):
    """No file of the server before; no file, no server and no address after."""
    shutil.rmtree(FILES, ignore_errors=True)
    yield
    shutil.rmtree(FILES, ignore_errors=True)
    run("/etc/rc.network", "nat-restart-dhcp")
    assert not processes(SERVER)
    LEASES.unlink(missing_ok=True)
    for link in links:
        for side in ([], ["-n", "net"]):
            # an interface goes on needing its own address of IPv6
            run("ip", *side, "-4", "addr", "flush", "dev", link)
            run("ip", *side, "-6", "addr", "flush", "dev", link, "scope", "global")


def switch(name, on=True):
    FILES.mkdir(exist_ok=True)
    (FILES / f"{name}.info").write_text(f'enable="{"yes" if on else "no"}"\n')


def bring_up(link, address):
    """Both ends up and in touch, and the appliance's with an address."""
    run("ip", "addr", "replace", address, "dev", link, *(["nodad"] if ":" in address else []))
    run("ip", "link", "set", link, "up")
    on_other_side("ip", "link", "set", link, "up")
    # the kernel hands on frames, and gives link-local addresses to ask from, a moment after that
    wait_for(lambda: all(is_in_touch(side, link) for side in (run, on_other_side)), what=f"the link of {link}")


def is_in_touch(side, link):
    up = "state UP" in side("ip", "link", "show", "dev", link).stdout
    return up and "fe80" in side("ip", "-6", "addr", "show", "dev", link, "scope", "link", "-tentative").stdout


def served_lines():
    return [line for line in SERVED.read_text().splitlines() if line]


def v4_subnet(network, first=10, last=20, options=(), **fields):
    """NETWORK.first to NETWORK.last."""
    return dhcp_subnet(options, **{
        "enabled": 1, "start_ip": f"{network}.{first}", "end_ip": f"{network}.{last}", "netmask": "255.255.255.0",
        "lease_time": 3600, "router": f"{network}.1", "domain": "lab.example", "dns1": f"{network}.53",
        "dns2": f"{network}.54", **fields,
    })  # fmt: skip


def write(link, conf, number=0, family=V4):
    """Switches service and interface on and has the library write a subnet."""
    switch("dhcpd")
    assert library.DHCPInterfaceSetEnabled(link.encode(), family, 1) == 0
    assert library.DHCPTagConfSet(link.encode(), number, family, ctypes.byref(conf)) == 0


def serve(link, network, number=0, **fields):
    """Gives the interface its address and has the library write an IPv4 subnet."""
    bring_up(link, f"{network}.1/24")
    write(link, v4_subnet(network, **fields), number)


def fix_lease(interface, link, address):
    """The static lease of the host on the other end of a link, who so gets his answer without a wait for others."""
    mac = on_other_side("cat", f"/sys/class/net/{link}/address").stdout.strip()
    (FILES / f"dhcpd-{interface}-static.conf").write_text(f"dhcp-host={mac},{address}\n")


def dhclient(link, folder, *statements, request=(), family="-4", flags=()):
    """What a dhclient on the other side is told, by the names its script sees; nothing when no server answers."""
    told, script, conf = folder / "told", folder / "dhclient-script", folder / "dhclient.conf"
    told.unlink(missing_ok=True)
    # RENEW6 is what the answer to -S is called
    script.write_text(
        '#!/bin/sh\ncase "$reason" in BOUND | BOUND6 | RENEW6) ;; *) exit 0 ;; esac\n'
        'env >"$TOLD.new" && mv "$TOLD.new" "$TOLD" && kill $PPID\n'
    )
    script.chmod(0o755)
    asked = f"request {', '.join(request)};\n" if request else ""
    conf.write_text("".join(f"{line};\n" for line in ("initial-interval 1", "timeout 20", *statements)) + asked)
    (folder / "dhclient.leases").unlink(missing_ok=True)
    run(*OTHER_SIDE, CLIENT, family, *flags, "-1", "-d", "-cf", conf, "-lf", folder / "dhclient.leases",
        "-pf", folder / "dhclient.pid", "-sf", script, "-e", f"TOLD={told}", link, status=None)  # fmt: skip
    lines = told.read_text().splitlines() if told.exists() else []
    return dict(line.removeprefix("new_").split("=", 1) for line in lines if line.startswith("new_"))


def busybox_script(folder, takes_address=False):
    script = folder / "udhcpc-script"
    take = 'ip addr replace "$ip/$mask" dev "$interface"\n' if takes_address else ""
    script.write_text(
        f'#!/bin/sh\n[ "$1" != deconfig ] || exit 0\n{take}'
        'env >"$TOLD.new" && mv "$TOLD.new" "$TOLD.$1"\n'
    )
    script.chmod(0o755)
    return script


def busybox_told(path):
    return dict(line.split("=", 1) for line in path.read_text().splitlines() if "=" in line)


def udhcpc(link, folder, *flags, requests=(), who=None, tries=20):
    """What busybox's client on the other side is told, by the names its script sees; nothing when nobody answers."""
    told = folder / f"udhcpc-{link}"
    told.with_suffix(".bound").unlink(missing_ok=True)
    more = [word for number in requests for word in ("-O", str(number))]
    identity = ["-C", "-x", f"0x3d:{who:04x}"] if who is not None else []
    run(*OTHER_SIDE, "env", f"TOLD={told}", "busybox", "udhcpc", "-f", "-q", "-n", "-t", tries, "-T", "1", "-i", link,
        "-s", busybox_script(folder), *identity, *more, *flags, status=None)  # fmt: skip
    return busybox_told(told.with_suffix(".bound")) if told.with_suffix(".bound").exists() else {}


class KeptLease(Daemon):
    """A busybox client on the other side that keeps its lease, and renews it when told to."""

    def __init__(self, link, folder, *flags):
        self.told = folder / f"udhcpc-kept-{link}"
        command = [*OTHER_SIDE, "env", f"TOLD={self.told}", "busybox", "udhcpc", "-f", "-t", "20", "-T", "1",
                   "-i", link, "-s", busybox_script(folder, takes_address=True), *flags]  # fmt: skip
        super().__init__(command, self.told.with_suffix(".bound").exists)

    def renew(self):
        """What the server says to the renewal."""
        answer = self.told.with_suffix(".renew")
        answer.unlink(missing_ok=True)
        self.process.send_signal(signal.SIGUSR1)
        wait_for(answer.exists, what="the renewal")
        return busybox_told(answer)
