#include <kovanetsdk/link.h>

#include "core/kernel_files.h"
#include "core/text.h"

using namespace kova;

namespace {

constexpr char kMasters[] = "/sys/class/net/bonding_masters";

/** @return 1 the line was read; 0 without the driver or an empty file; -1 with log and code */
int read_masters(first_line &line) {
    if (!line.is_open() || (!line.is_read() && errno == 0)) {
        return 0;
    }
    return line.is_read() ? 1 : fail(HERE, NET_ERR_FILE_READ, -1, "Fail to read [%s], errno=[%d/%m]", kMasters, errno);
}

} // namespace

extern "C" int KOVANetLinkAggrExist(void) {
    first_line masters{kMasters};
    return read_masters(masters);
}

extern "C" int KOVANetLinkAggrEnum(KLIBSZLIST *pBonds) {
    if (refuses_null(HERE, "pBonds", pBonds)) {
        return -1;
    }
    const string_list names = make_list();
    const string_list slaves = make_list();
    if (!names.is_held() || !slaves.is_held()) {
        return fail(HERE, NET_ERR_OUT_OF_MEMORY, -1, "Failed to alloc memory.");
    }
    first_line masters{kMasters};
    const int read = read_masters(masters);
    if (read < 1) {
        return read;
    }
    const int count = split(masters.text(), " \t\n", names.get());
    for (int i = 0; i < count; ++i) {
        const char *const szBond = KLIBCSzListGet(names.get(), i);
        KLIBCSzListRemoveAll(slaves.get());
        if (KOVANetLinkAggrPhyGet(szBond, slaves.get()) > 0 && KLIBCSzListPush(&pBonds, szBond) < 0) {
            return -1;
        }
    }
    return count;
}
