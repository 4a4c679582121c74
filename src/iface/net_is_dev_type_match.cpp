#include <kovanetsdk/iface.h>

#include "iface/interface_record.h"

#include <cstring>

extern "C" int KOVANetIsDevTypeMatch(const char *szIfname, int kind) {
    using namespace kova;
    if (refuses_null_text(HERE, "szIfname", szIfname)) {
        return 0;
    }
    IFINFO records[kMaxInterfaces];
    const int count = KLIBNetGetInterfaceInfo(records, kMaxInterfaces, kind);
    if (count < 0) {
        return fail_keeping_code(HERE, 0, "Failed to KLIBNetGetInterfaceInfo(0x%X)=[%d], kovaerr=[0x%04X]",
                                 static_cast<unsigned>(kind), count, KLIBCErrGet());
    }
    for (int i = 0; i < count; ++i) {
        if (strcmp(records[i].szIfname, szIfname) == 0) {
            return 1;
        }
    }
    return fail_quietly(HERE, NET_ERR_NOT_FOUND, 0);
}
