#include <kovanetsdk/link.h>

#include "core/report.h"
#include "core/text.h"

#include <cstdlib>
#include <cstring>

namespace {

constexpr int kMaxSlaves = 32;
using slave_name = char[16];

int compare_names(const void *left, const void *right) {
    return strncmp(static_cast<const char *>(left), static_cast<const char *>(right), sizeof(slave_name));
}

} // namespace

extern "C" int KOVANetLinkAggrOptSlsaveAdd(KOVALINKAGGROPT *pOpt, const char *szSlave) {
    using namespace kova;
    if (refuses_null(HERE, "pOpt", pOpt) || refuses_text(HERE, "szSlave", szSlave) ||
        refuses(HERE, 0 <= pOpt->cSlaves, "0 <= pOpt->cSlaves")) {
        return -1;
    }
    if (pOpt->cSlaves >= kMaxSlaves) {
        return fail(HERE, NET_ERR_FULL, -1, "No room for slave %s in [%.16s]", szSlave, pOpt->szName);
    }
    slave_name name = {}; // looked up as it will be stored, and without stray bytes behind it
    copy_text(name, szSlave);
    const auto number = static_cast<size_t>(pOpt->cSlaves);
    if (bsearch(name, pOpt->aszSlaves, number, sizeof(slave_name), compare_names) != nullptr) {
        return fail(HERE, NET_ERR_EXISTS, -1, "Slave %s is already in [%.16s]", name, pOpt->szName);
    }
    fail_quietly(HERE, NET_ERR_NOT_FOUND, 0);
    memcpy(pOpt->aszSlaves[number], name, sizeof name);
    ++pOpt->cSlaves;
    qsort(pOpt->aszSlaves, number + 1, sizeof(slave_name), compare_names);
    return 0;
}
