"""The library, called from a test as a C program calls it."""
import ctypes


class NetInfo(ctypes.Structure):
    _fields_ = [("nIPSource", ctypes.c_uint32), ("blLinkUp", ctypes.c_uint32), ("szIfname", ctypes.c_char * 16),
                ("abMac", ctypes.c_ubyte * 6), ("szIP", ctypes.c_char * 20), ("szMask", ctypes.c_char * 20)]


class IfInfo(ctypes.Structure):
    _fields_ = [("szIfname", ctypes.c_char * 16), ("abMac", ctypes.c_ubyte * 6), ("szIP", ctypes.c_char * 64),
                ("nLink", ctypes.c_uint32), ("nFlags", ctypes.c_uint32), ("szMask", ctypes.c_char * 20)]


class EthInfo(ctypes.Structure):
    _fields_ = [("nSpeed", ctypes.c_int32), ("nDuplex", ctypes.c_int32), ("nMTU", ctypes.c_int32),
                ("nSupported", ctypes.c_uint32), ("nBestSpeed", ctypes.c_int32), ("nBestDuplex", ctypes.c_int32),
                ("szBestMode", ctypes.c_char * 16)]


class DhcpOption(ctypes.Structure):
    pass  # its fields name it


DhcpOption._fields_ = [("number", ctypes.c_int32), ("name", ctypes.c_char * 52), ("value", ctypes.c_char * 1024),
                       ("items", ctypes.c_void_p), ("next", ctypes.POINTER(DhcpOption))]


class DhcpPxeConf(ctypes.Structure):
    _fields_ = [("enabled", ctypes.c_int32), ("is_remote_tftp", ctypes.c_int32),
                ("local_bootloader", ctypes.c_char * 4096), ("remote_bootloader", ctypes.c_char * 4096),
                ("remote_tftp_server_ip", ctypes.c_char * 20)]


class DhcpTagConf(ctypes.Structure):
    _fields_ = [("enabled", ctypes.c_int32), ("reserved", ctypes.c_int32), ("lease_time", ctypes.c_int32),
                ("start_ip", ctypes.c_char * 46), ("end_ip", ctypes.c_char * 46), ("ifname", ctypes.c_char * 16),
                ("domain", ctypes.c_char * 4096), ("dns1", ctypes.c_char * 46), ("dns2", ctypes.c_char * 46),
                ("dns_more", ctypes.c_char * 4096), ("netmask", ctypes.c_char * 46), ("router", ctypes.c_char * 46),
                ("reserved_text", ctypes.c_char * 4096), ("tag", ctypes.c_char * 20), ("v6_mode", ctypes.c_char * 20),
                ("options", ctypes.POINTER(DhcpOption))]


class VlanInfo(ctypes.Structure):
    _fields_ = [("szIfname", ctypes.c_char * 16), ("szRowDevice", ctypes.c_char * 16), ("vlanId", ctypes.c_uint32)]


class Bond(ctypes.Structure):
    _fields_ = [("szName", ctypes.c_char * 16), ("mode", ctypes.c_int32), ("blNoPartner", ctypes.c_int32),
                ("cSlaves", ctypes.c_int32), ("aszSlaves", ctypes.c_char * 16 * 32)]

    def members(self):
        return [self.aszSlaves[i].value.decode() for i in range(self.cSlaves)]


class BridgeInfo(ctypes.Structure):
    _fields_ = [("nType", ctypes.c_int32), ("szIfname", ctypes.c_char * 16), ("szPeer", ctypes.c_char * 16)]


class TopologyInfo(ctypes.Structure):
    _fields_ = [("nTopology", ctypes.c_int), ("szName", ctypes.c_char * 64), ("szIfname", ctypes.c_char * 16),
                ("blClient", ctypes.c_int), ("nIFInfoRow", ctypes.c_int)]


class PppoeConf(ctypes.Structure):
    _fields_ = [("szIfname", ctypes.c_char * 16), ("szUser", ctypes.c_char * 256), ("szPassword", ctypes.c_char * 32),
                ("szMTU", ctypes.c_char * 8), ("blDefaultRoute", ctypes.c_uint32)]


class PppoeRelayConf(ctypes.Structure):
    _fields_ = [("blEnabled", ctypes.c_uint32), ("szServer", ctypes.c_char * 16)]


DHCP, STATIC = 0, 1
library = ctypes.CDLL("libkovanetsdk.so.6")
core = ctypes.CDLL("libkovacore.so.6")
core.KLIBCErrGet.restype = ctypes.c_uint32
core.KLIBCErrorGetFile.restype = ctypes.c_char_p
core.KLIBCSzListAlloc.restype = core.KLIBCSzHashAlloc.restype = ctypes.c_void_p


def card(source, name, address="", mask=""):
    return NetInfo(nIPSource=source, szIfname=name.encode(), szIP=address.encode(), szMask=mask.encode())


def set_card(new, old=None):
    return library.KOVANetSetCard1(ctypes.byref(new), ctypes.byref(old) if old else None)


def get_card(index):
    """The card of an index, or None when there is none."""
    found = NetInfo()
    answer = library.KOVANetGetCard1(index, None, ctypes.byref(found))
    assert answer >= 0, register()
    return found if answer else None


def register():
    """The error register: code and unit."""
    return core.KLIBCErrGet(), core.KLIBCErrorGetFile().decode()


def enumerated(call, kind):
    """The records of an enumeration, by name."""
    records = (IfInfo * 32)()
    count = call(records, len(records), kind)
    assert count >= 0, register()
    found = {record.szIfname.decode(): record for record in records[:count]}
    assert len(found) == count
    return found


def interfaces(kind):
    return enumerated(library.KLIBNetGetInterfaceInfo, kind)


def string_list(texts):
    """A platform's list, as a pointer; freed with the process."""
    made = ctypes.c_void_p(core.KLIBCSzListAlloc(len(texts) or 1))
    for text in texts:
        assert core.KLIBCSzListPush(ctypes.byref(made), text.encode()) == 0
    return made


def string_map(texts):
    """A platform's map, as a pointer; freed with the process."""
    made = ctypes.c_void_p(core.KLIBCSzHashAlloc(len(texts) or 1))
    for key, value in texts.items():
        assert core.KLIBCSzHashSetValue(made, key.encode(), value.encode()) == 0
    return made


def dhcp_options(options):
    """The first record of a list of options, each a number, a name and a text or a list of texts; None without any."""
    head = None
    for number, name, value in reversed(options):
        record = DhcpOption(number=number, name=name.encode())
        if isinstance(value, str):
            record.value = value.encode()
        else:
            record.items = string_list(value)
        if head is not None:
            record.next = ctypes.pointer(head)
        head = record
    return head


def dhcp_subnet(options=(), **fields):
    """A DhcpTagConf from texts and numbers."""
    conf = DhcpTagConf(**{name: value.encode() if isinstance(value, str) else value for name, value in fields.items()})
    head = dhcp_options(list(options))
    if head is not None:
        conf.options = ctypes.pointer(head)
    return conf
