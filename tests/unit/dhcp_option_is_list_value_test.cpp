#include "support/rig.h"

#include <kovanetsdk/dhcp.h>
#include <set>

using namespace kova_test;

class dhcp_option_is_list_value : public unit_test {};

TEST_F(dhcp_option_is_list_value, DHCPOptionIsListValue_everyNumber_isWhatTheTableSays) {
    const std::set<unsigned> lists{7, 9, 21, 41, 42, 44, 45, 48, 49, 65, 68, 69, 70, 71, 74, 120, 121};
    for (unsigned number = 0; number < 1000; ++number) {
        EXPECT_OUTCOME(rig.observe([=] { return DHCPOptionIsListValue(number); }),
                       {.result = lists.count(number) > 0 ? 1 : 0});
    }
    for (const unsigned number : {UINT32_MAX, UINT32_MAX - 120, 1U << 31, (1U << 31) + 121}) {
        EXPECT_OUTCOME(rig.observe([=] { return DHCPOptionIsListValue(number); }), {.result = 0});
    }
}

TEST_F(dhcp_option_is_list_value, DHCPOptionFree_chain_isFreedWithItsLists) {
    EXPECT_OUTCOME(rig.observe([] {
        DHCPOptionFree(nullptr);
        DHCP_OPTION *head = nullptr;
        for (int i = 0; i < 3; ++i) {
            auto *const option = static_cast<DHCP_OPTION *>(calloc(1, sizeof(DHCP_OPTION)));
            option->items = i == 1 ? nullptr : KLIBCSzListAlloc(4);
            option->next = head;
            head = option;
        }
        DHCPOptionFree(head); // the rig counts the lists
        return 0L;
    }),
                   {.result = 0});
}
