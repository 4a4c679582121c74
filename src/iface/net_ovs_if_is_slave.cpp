#include <kovanetsdk/iface.h>

#include "core/kernel_files.h"
#include "core/text.h"

#include <unistd.h>

extern "C" int KLIBNetOVSIfIsSlave(const char *szIfname) {
    using namespace kova;
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return 0;
    }
    const path_text own_port{"/sys/devices/virtual/net/ovs_%s", szIfname};
    return access(own_port.c_str(), R_OK) != 0 && is_ovs_bond_member(HERE, szIfname) ? 1 : 0;
}
