"""The frames of a cable as the other side sees them, and frames of its own making."""
import contextlib
import ctypes
import os
import socket
import struct
import threading

EVERY_PROTOCOL = 0x0003
SOL_PACKET, PACKET_AUXDATA, PACKET_OUTGOING = 263, 8, 4
VLAN_IS_VALID = 1 << 4
NEW_NETWORK = 0x40000000

libc = ctypes.CDLL(None, use_errno=True)


def socket_on_other_side(*kind):
    """A socket made in the namespace "net". The thread that enters it ends with this call."""
    made = []

    def make():
        with open("/run/netns/net") as namespace:
            if libc.setns(namespace.fileno(), NEW_NETWORK) != 0:
                made.append(OSError(ctypes.get_errno(), "setns"))
                return
        made.append(socket.socket(*kind))

    thread = threading.Thread(target=make)
    thread.start()
    thread.join()
    if isinstance(made[0], OSError):
        raise made[0]
    return made[0]


def packet_socket(link):
    packets = socket_on_other_side(socket.AF_PACKET, socket.SOCK_RAW, socket.htons(EVERY_PROTOCOL))
    packets.setsockopt(SOL_PACKET, PACKET_AUXDATA, 1)
    packets.bind((link, EVERY_PROTOCOL))
    return packets


@contextlib.contextmanager
def in_order():
    """What is sent from here arrives in this order: the kernel has a queue for each processor, and a loaded one lags."""
    before = os.sched_getaffinity(0)
    os.sched_setaffinity(0, {min(before)})
    yield
    os.sched_setaffinity(0, before)


def send(link, frame):
    with packet_socket(link) as packets:
        packets.send(frame)


class Frame:
    """A frame, with the VLAN that it was tagged with on the cable, or None."""

    def __init__(self, content, vlan):
        self.content, self.vlan = content, vlan
        self.target, self.source, (self.protocol,) = content[:6], content[6:12], struct.unpack("!H", content[12:14])

    @staticmethod
    def received(packets):
        content, extra, _, (_, _, kind, *_) = packets.recvmsg(65536, socket.CMSG_SPACE(20))
        if kind == PACKET_OUTGOING or len(content) < 14:
            return None
        vlan = None
        for _, _, told in extra:  # the kernel takes the tag off and tells it beside the frame
            status, _, _, _, _, tag, _ = struct.unpack("IIIHHHH", told[:20])
            vlan = tag & 0xFFF if status & VLAN_IS_VALID else None
        return Frame(content, vlan)


@contextlib.contextmanager
def captured(link):
    """Fills a list with the frames that reach the other end of a cable, until the block is left."""
    frames = []
    with packet_socket(link) as packets:
        packets.settimeout(0.05)
        ended = threading.Event()

        def receive():
            while not ended.is_set():
                with contextlib.suppress(TimeoutError):
                    if frame := Frame.received(packets):
                        frames.append(frame)

        thread = threading.Thread(target=receive)
        thread.start()
        try:
            yield frames
        finally:
            ended.set()
            thread.join()
