#include <kovanetsdk/link.h>

#include "core/guards.h"
#include "core/report.h"

using namespace kova;

namespace {

constexpr char kConfig[] = "/proc/net/vlan/config";
constexpr int kHeaderLines = 2;

/** @return 0; -1, logged, for a line that tells no VLAN */
int read_vlan(const char *line, VLANINFO &vlan) {
    if (line == nullptr) {
        return fail_keeping_code(HERE, -1, "Get NULL string from %s", kConfig);
    }
    if (sscanf(line, "%15s\t| %u  | %15s", vlan.szIfname, &vlan.vlanId, vlan.szRowDevice) != 3) {
        return fail(HERE, NET_ERR_PARSE, -1, "Get wrong format from %s: %s", kConfig, line);
    }
    return 0;
}

} // namespace

extern "C" int KLIBNetVlanEnum(VLANINFO **ppVlans, int *pCount) {
    if (refuses_null(HERE, "ppVlans", ppVlans) || refuses_null(HERE, "pCount", pCount)) {
        return -1;
    }
    *ppVlans = nullptr;
    *pCount = 0;
    if (KLIBCFileExist(kConfig) != 1) {
        return 0;
    }
    constexpr int kLines = 512;
    const string_list lines = make_list(kLines);
    if (!lines.is_held()) {
        return fail_quietly(HERE, NET_ERR_OUT_OF_MEMORY, -1);
    }
    if (KLIBCFileReadLines(kConfig, lines.get()) < 0) {
        return -1;
    }
    const int count = static_cast<int>(lines.get()->nItem) - kHeaderLines;
    if (count < 0) {
        return 0;
    }
    heap<VLANINFO> vlans{static_cast<VLANINFO *>(calloc(static_cast<size_t>(count) + 1, sizeof(VLANINFO)))};
    if (vlans == nullptr) {
        return fail_quietly(HERE, NET_ERR_OUT_OF_MEMORY, -1);
    }
    for (int i = 0; i < count; ++i) {
        if (read_vlan(KLIBCSzListGet(lines.get(), i + kHeaderLines), vlans.get()[i]) < 0) {
            return -1;
        }
    }
    *ppVlans = vlans.release();
    *pCount = count;
    return 0;
}
