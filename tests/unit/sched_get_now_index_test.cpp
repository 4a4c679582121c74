#include "support/rig.h"

#include <cstdlib>
#include <kovanetsdk/tunnel.h>

using namespace kova_test;

class sched_get_now_index : public unit_test {
protected:
    /** The clock of the tests stands at Tuesday, 2023-11-14 22:13:20 UTC. */
    outcome index_in(const std::string &zone) {
        setenv("TZ", zone.c_str(), 1);
        return rig.observe([] { return KOVASchedGetNowIndex(); });
    }
    /** The same in a zone that is further away than any in use: zone files allow it. */
    outcome index_at(int hours) {
        const auto seconds = static_cast<unsigned>(hours * 3600);
        std::string file = "TZif" + std::string(28, '\0');    // version, and three numbers of what it has none of
        for (const unsigned number : {0U, 1U, 4U, seconds}) { // moments, kinds of time, length of names; the one kind
            for (const int shift : {24, 16, 8, 0}) {
                file += static_cast<char>(number >> shift);
            }
        }
        const std::string path = "/tmp/zone" + std::to_string(hours);
        write_file(path, file + std::string("\0\0ZZZ\0", 6));
        return index_in(":" + path);
    }
    void TearDown() override {
        unsetenv("TZ");
        tzset();
        unit_test::TearDown();
    }
};

TEST_F(sched_get_now_index, KOVASchedGetNowIndex_zones_countTheLocalHourFromSunday) {
    EXPECT_OUTCOME(index_in("UTC"), {.result = 2 * 24 + 22});
    EXPECT_OUTCOME(index_in("AAA-1"), {.result = 2 * 24 + 23});
    EXPECT_OUTCOME(index_in("BBB-2"), {.result = 3 * 24});
    EXPECT_OUTCOME(index_in("CCC22:14"), {.result = 1 * 24 + 23});
}

TEST_F(sched_get_now_index, KOVASchedGetNowIndex_ends_are0And167) {
    EXPECT_OUTCOME(index_at(-71), {.result = 167});
    EXPECT_OUTCOME(index_at(-70), {.result = 0});
    EXPECT_OUTCOME(index_at(4 * 24 + 1), {.result = 167});
    EXPECT_OUTCOME(index_at(4 * 24 + 2), {.result = 0});
}

TEST_F(sched_get_now_index, KOVASchedGetNowIndex_zoneThatChanges_isFollowed) {
    EXPECT_OUTCOME(index_in("UTC"), {.result = 2 * 24 + 22});
    EXPECT_OUTCOME(index_in("BBB-2"), {.result = 3 * 24});
}
