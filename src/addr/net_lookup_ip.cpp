#include <kovanetsdk/addr.h>

#include "core/host_names.h"

#include <arpa/inet.h>
#include <cstring>

namespace {

using namespace kova;

/** The caller's records, filled in the order in which addresses are found. */
class found_addresses {
public:
    found_addresses(KOVALOOKUPIP *records, int capacity, bool counts_all)
        : records_(records), capacity_(capacity), counts_all_(counts_all) {
        if (capacity > 0) {
            memset(records, 0, static_cast<size_t>(capacity) * sizeof *records);
        }
    }

    /** Stores an address, or only counts it. @return false when there is no use for it, nor for any after it */
    bool add(int family, const void *bytes) {
        if (count_ >= capacity_ && !counts_all_) {
            return false;
        }
        if (count_ < capacity_) {
            inet_ntop(family, bytes, records_[count_].szIP, sizeof records_[count_].szIP);
            records_[count_].nFamily = family;
        }
        ++count_;
        return true;
    }
    [[nodiscard]] int count() const { return count_; }

private:
    KOVALOOKUPIP *records_;
    int capacity_;
    bool counts_all_;
    int count_ = 0;
};

void ask_resolver(const char *szName, found_addresses &found) {
    addrinfo hints{};
    hints.ai_socktype = SOCK_STREAM; // each address once, not once more for every kind of socket
    address_list answers;
    if (getaddrinfo(szName, nullptr, &hints, answers.out()) != 0) {
        return;
    }
    bool is_useful = true;
    for (const addrinfo *answer = answers.get(); answer != nullptr && is_useful; answer = answer->ai_next) {
        if (answer->ai_family == AF_INET) {
            is_useful = found.add(AF_INET, &reinterpret_cast<const sockaddr_in *>(answer->ai_addr)->sin_addr);
        } else if (answer->ai_family == AF_INET6) {
            is_useful = found.add(AF_INET6, &reinterpret_cast<const sockaddr_in6 *>(answer->ai_addr)->sin6_addr);
        }
    }
}

void ask_local_network(const char *szName, found_addresses &found) {
    netbios_answers answers{HERE, szName};
    in_addr address;
    while (answers.next(address) && found.add(AF_INET, &address)) {
    }
}

} // namespace

extern "C" int KOVANetLookupIP(const char *szName, KOVALOOKUPIP *pResult, int cResult, int blCountAll) {
    if (refuses_text(HERE, "szName", szName) || refuses(HERE, 0 <= cResult, "0 <= cResult") ||
        (cResult > 0 && refuses_null(HERE, "pResult", pResult))) {
        return 0;
    }
    found_addresses found{pResult, cResult, blCountAll != 0};
    ask_resolver(szName, found);
    if (found.count() == 0 && strpbrk(szName, ".:") == nullptr) {
        ask_local_network(szName, found);
    }
    return found.count();
}
