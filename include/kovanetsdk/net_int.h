/**
 * @file
 * Internal: the initialiser of a card record. Not installed.
 */
#ifndef KOVANETSDK_NET_INT_H
#define KOVANETSDK_NET_INT_H

#include "core/report.h"
#include "core/text.h"

#include <cstring>
#include <kovanetsdk/iface.h>

namespace kova {

/**
 * Zeroes a card record and, given an interface record, takes over its name, hardware address and link.
 * @return 0; -1 with NET_ERR_BAD_PARAMETER when there is no record
 */
inline int init_net_info(NETINFO *pNetInfo, const IFINFO *pInfo) {
    constexpr uint32_t kHasLink = 2;
    const place at{"include/kovanetsdk/net_int.h", __func__, __LINE__, lead::unit};
    if (refuses(at, pNetInfo != nullptr, "((void *)0) != pNetInfo")) {
        return -1;
    }
    *pNetInfo = {};
    if (pInfo != nullptr) {
        copy_text(pNetInfo->szIfname, pInfo->szIfname);
        memcpy(pNetInfo->abMac, pInfo->abMac, sizeof pNetInfo->abMac);
        pNetInfo->blLinkUp = (pInfo->nLink & kHasLink) != 0 ? 1 : 0;
    }
    return 0;
}

} // namespace kova

#endif
