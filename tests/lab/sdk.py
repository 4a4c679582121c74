"""The library, called from a test as a C program calls it."""
import ctypes


class NetInfo(ctypes.Structure):
    _fields_ = [("nIPSource", ctypes.c_uint32), ("blLinkUp", ctypes.c_uint32), ("szIfname", ctypes.c_char * 16),
                ("abMac", ctypes.c_ubyte * 6), ("szIP", ctypes.c_char * 20), ("szMask", ctypes.c_char * 20)]


class DhcpTagConf(ctypes.Structure):
    _fields_ = [("enabled", ctypes.c_int32), ("reserved", ctypes.c_int32), ("lease_time", ctypes.c_int32),
                ("start_ip", ctypes.c_char * 46), ("end_ip", ctypes.c_char * 46), ("ifname", ctypes.c_char * 16),
                ("domain", ctypes.c_char * 4096), ("dns1", ctypes.c_char * 46), ("dns2", ctypes.c_char * 46),
                ("dns_more", ctypes.c_char * 4096), ("netmask", ctypes.c_char * 46), ("router", ctypes.c_char * 46),
                ("reserved_text", ctypes.c_char * 4096), ("tag", ctypes.c_char * 20), ("v6_mode", ctypes.c_char * 20),
                ("options", ctypes.c_void_p)]


DHCP, STATIC = 0, 1
library = ctypes.CDLL("libkovanetsdk.so.6")
core = ctypes.CDLL("libkovacore.so.6")
core.KLIBCErrGet.restype = ctypes.c_uint32
core.KLIBCErrorGetFile.restype = ctypes.c_char_p


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
