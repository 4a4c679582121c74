#include <kovanetsdk/addr.h>

#include <arpa/inet.h>
#include <bit>

extern "C" int KOVANetNetmaskToPrefix(const char *szMask) {
    in_addr mask;
    if (szMask == nullptr || inet_aton(szMask, &mask) == 0) {
        return -1;
    }
    return std::popcount(mask.s_addr);
}
