#include "support/rig.h"

#include <arpa/inet.h>
#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

class net_ntoa : public unit_test {};

TEST_F(net_ntoa, KOVANetNtoa_address_isWrittenLowestByteInMemoryFirst) {
    for (const char *text : {"1.2.3.4", "0.0.0.0", "255.255.255.255", "192.168.1.200"}) {
        in_addr address = {};
        ASSERT_EQ(1, inet_pton(AF_INET, text, &address));
        std::string got;
        EXPECT_OUTCOME(rig.observe([&] {
            got = KOVANetNtoa(address.s_addr);
            return 0;
        }),
                       {.result = 0});
        EXPECT_EQ(text, got);
    }
}

TEST_F(net_ntoa, KOVANetNtoa_nextCall_overwritesTheText) {
    const char *const first = KOVANetNtoa(htonl(0x01020304));
    const char *const second = KOVANetNtoa(htonl(0x0A000001));
    EXPECT_EQ(first, second);
    EXPECT_STREQ("10.0.0.1", first);
}

} // namespace
