#include "support/rig.h"

#include <cerrno>
#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_is_if_up : public unit_test {
protected:
    outcome is_up(const char *szIfname = "eth0") {
        return rig.observe([=] {
            errno = 0;
            return KOVANetIsIFUp(szIfname);
        });
    }
};

TEST_F(net_is_if_up, KOVANetIsIFUp_missing_name_is_refused) {
    EXPECT_OUTCOME(is_up(nullptr), refusal("net_is_if_up", "((void *)0) != szIfname", 0));
    EXPECT_OUTCOME(is_up(""), refusal("net_is_if_up", "'\\0' != *szIfname", 0));
}

TEST_F(net_is_if_up, KOVANetIsIFUp_name_that_is_none_is_refused) {
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(is_up(name.c_str()), refusal("net_is_if_up", "is_interface_name(szIfname)", 0));
    }
}

TEST_F(net_is_if_up, KOVANetIsIFUp_lowest_bit_decides) {
    const std::map<std::string, int> files{{"0x1\n", 1}, {"0x1003\n", 1},   {"0x1002\n", 0},
                                           {"0x0\n", 0}, {"0xFFFFFFFE", 0}, {"0xffffffff\n", 1}};
    for (const auto &[content, result] : files) {
        rig.replace_file("/sys/class/net/eth0/flags", content);
        EXPECT_OUTCOME(is_up(), {.result = result});
    }
}

TEST_F(net_is_if_up, KOVANetIsIFUp_no_file_is_down) {
    for (const std::string &name :
         texts{"eth9", long_text(15), long_text(16), long_text(17), long_text(63), long_text(235)}) {
        EXPECT_OUTCOME(is_up(name.c_str()), {.result = 0});
    }
    rig.fail("fopen");
    EXPECT_OUTCOME(is_up("lo"), {.result = 0});
}

TEST_F(net_is_if_up, KOVANetIsIFUp_file_that_is_no_flags_word_is_told) {
    for (const std::string &content : {std::string(), std::string("\n"), std::string("up\n"), std::string("1003\n"),
                                       std::string("0x\n"), std::string(4096, '\0'), std::string("\xff\xfe\x80")}) {
        rig.replace_file("/sys/class/net/eth0/flags", content);
        EXPECT_OUTCOME(is_up(), {.result = 0, .log = {"ERR net_is_if_up:N fscanf failed. Success"}});
    }
    rig.redirect("/sys/class/net/eth0/flags", "/dev/zero"); // a line without end
    EXPECT_OUTCOME(is_up(), {.result = 0, .log = {"ERR net_is_if_up:N fscanf failed. Success"}});
    rig.redirect("/sys/class/net/eth0/flags", "/etc"); // opened, but not to be read
    EXPECT_OUTCOME(is_up(), {.result = 0, .log = {"ERR net_is_if_up:N fscanf failed. Is a directory"}});
}

TEST_F(net_is_if_up, KOVANetIsIFUp_line_without_end_is_not_read_whole) {
    rig.replace_file("/sys/class/net/eth0/flags", "0x" + long_text(1 << 20, 'f'));
    EXPECT_OUTCOME(is_up(), {.result = 1});
}

TEST_F(net_is_if_up, KOVANetIsIFUp_follows_a_real_interface) {
    shell("ip link add kovat0 type veth peer name kovat1");
    EXPECT_OUTCOME(is_up("kovat0"), {.result = 0});
    shell("ip link set kovat0 up");
    EXPECT_OUTCOME(is_up("kovat0"), {.result = 1});
    shell("ip link del kovat0");
    EXPECT_OUTCOME(is_up("kovat0"), {.result = 0});
}
