"""The library, called from a test as a C program calls it."""
import ctypes


class NetInfo(ctypes.Structure):
    _fields_ = [("nIPSource", ctypes.c_uint32), ("blLinkUp", ctypes.c_uint32), ("szIfname", ctypes.c_char * 16),
                ("abMac", ctypes.c_ubyte * 6), ("szIP", ctypes.c_char * 20), ("szMask", ctypes.c_char * 20)]


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
