"""Where tests run: in a box on the kernel at hand, or in a guest, which has a kernel of its own with every kind of interface
but takes longer for everything."""
import functools
import pathlib
import subprocess

BOX = pathlib.Path(__file__).resolve().parent.parent / "build" / "lab" / "kova-box"
# what a test can need, and a command that succeeds where the kernel has it; "probe" is deleted afterwards
KERNEL_PARTS = {
    "bonding": "ip link add probe type bond",
    "bridge": "ip link add probe type bridge",
    "dummy": "ip link add probe type dummy",
    "flower": "tc qdisc add dev eth0 clsact && tc filter add dev eth0 ingress protocol ip pref 1 flower action drop",
    "openvswitch": "test -d /sys/module/openvswitch || modprobe openvswitch",
    "ppp": "test -c /dev/ppp && exec 3<>/dev/ppp",
    "pppoe": "/usr/bin/python3 -c 'import socket; socket.socket(24, socket.SOCK_STREAM, 0)'",
    "sit": "ip link add probe type sit local 192.0.2.1 remote 192.0.2.2",
    "tbf": "tc qdisc add dev eth0 root tbf rate 1mbit burst 10kb latency 50ms",
    "tun": "ip tuntap add dev probe mode tun",
    "veth": "ip link add probe type veth peer name probe2",
    "vlan": "ip link add link eth0 name probe type vlan id 5",
}


def in_backend(backend, options, command):
    return [str(BOX), *(["--guest"] if backend == "guest" else []), *options, "--", *command]


@functools.cache
def refusal(backend):
    """Why a backend cannot be had on this machine; empty when it can."""
    tried = subprocess.run(in_backend(backend, [], ["true"]), stdin=subprocess.DEVNULL, stdout=subprocess.PIPE,
                           stderr=subprocess.STDOUT, text=True, errors="replace")
    return (tried.stdout.splitlines() or [f"status {tried.returncode}"])[0] if tried.returncode else ""


@functools.cache
def parts_of(backend):
    """Of KERNEL_PARTS, what a backend's kernel has."""
    script = "".join(f"if ({probe}) >/dev/null 2>&1; then echo {part}; ip link del probe 2>/dev/null; fi\n"
                     for part, probe in KERNEL_PARTS.items())
    return frozenset(subprocess.run(in_backend(backend, [], ["sh", "-c", script]), stdin=subprocess.DEVNULL,
                                    stdout=subprocess.PIPE, text=True).stdout.split())


def shortcoming(backend, needs):
    """Why a backend is of no use for what needs parts of a kernel; empty when it is of use."""
    missing = sorted(needs - parts_of(backend)) if needs and not refusal(backend) else []
    return refusal(backend) or (f"no {', '.join(missing)} in its kernel" if missing else "")
