// Telling addresses from other texts.
#include "rows.h"
#include "world.h"

#include <algorithm>
#include <arpa/inet.h>
#include <kovanetsdk/addr.h>

namespace kova {

namespace {

// What files, forms and scripts hold: addresses most of the time, and the mistakes people make.
constexpr const char *kTexts[] = {
    "192.168.1.10",    "192.168.1.1",
    "10.0.0.1",        "10.20.30.40",
    "172.16.254.3",    "172.31.255.254",
    "192.168.100.50",  "203.0.113.77",
    "198.51.100.200",  "8.8.8.8",
    "1.1.1.1",         "169.254.12.240",
    "100.64.0.9",      "192.168.178.123",
    "192.0.2.33",      "223.255.255.254",
    "192.168.1.256",   "192.168.1",
    "192.168.1.1.1",   "300.1.1.1",
    "nas01",           "",
    "192.168.1.10/24", "fe80::1",
};

// Both sides find the same texts valid, so that they do the same work.
constexpr long kValid = 16;

sides against_inet_pton() {
    constexpr int kTimes = 500;
    return {timed(kTimes,
                  [] {
                      require_done(std::count_if(std::begin(kTexts), std::end(kTexts),
                                                 [](const char *text) { return BlKLIBIsIpAddr(text) == 1; }) == kValid,
                                   "BlKLIBIsIpAddr failed");
                  }),
            timed(kTimes, [] {
                in_addr address;
                require_done(std::count_if(std::begin(kTexts), std::end(kTexts),
                                           [&](const char *text) { return inet_pton(AF_INET, text, &address) == 1; }) ==
                                 kValid,
                             "inet_pton failed");
            })};
}

} // namespace

contests address_contests() {
    return {{"address", "inet_pton", "BlKLIBIsIpAddr, 16 addresses and 8 other texts", "inet_pton", 1.5, 40,
             against_inet_pton}};
}

} // namespace kova
