#include "support/memory.h"
#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/dhcp.h>

using namespace kova_test;

namespace {

const std::string kConf = "/etc/dhcpd/dhcpd-eth0-subnet0.conf";
const std::string kFragment =
    "interface=eth0\ndhcp-range=set:eth00,10.1.0.10,10.1.0.99,255.255.255.0,60\n"
    "dhcp-option=tag:eth00,option:router,10.1.0.1\n"
    "dhcp-option=tag:eth00,option:domain-search,a\ndhcp-option=tag:eth00,option:domain-name,a\n"
    "dhcp-option=tag:eth00,option:dns-server,10.1.0.2\n";
const std::string kErr = "ERR dhcp_option_read:N ";

std::string warning(const std::string &line) {
    return "WARNING dhcp_conf:N Wrong user-defined dhcp option format [" + line + "]";
}

std::string malformed(const std::string &line) {
    return kErr + "List get failed or wrong user-defined dhcp option format [" + line + "]";
}

} // namespace

/** The options are read by the reader of a subnet. */
class dhcp_option_read : public unit_test {
protected:
    /** Reads a fragment that ends with these lines. */
    outcome read(const std::string &lines) {
        write_file(kConf, kFragment + lines);
        found.clear();
        return rig.observe([&] {
            DHCP_TAG_CONF conf{};
            const int result = DHCPTagConfGet("eth0", 0, 0, &conf);
            for (const DHCP_OPTION *option = conf.options; option != nullptr; option = option->next) {
                found.push_back(shown(*option));
            }
            DHCPOptionFree(conf.options);
            return result;
        });
    }
    static std::string shown(const DHCP_OPTION &option) {
        std::string text = std::to_string(option.number) + " " + option.name + " [" + option.value + "]";
        for (uint32_t i = 0; option.items != nullptr && i < option.items->nItem; ++i) {
            text += " " + std::string(KLIBCSzListGet(option.items, static_cast<int>(i)));
        }
        return text;
    }

    texts found;
};

TEST_F(dhcp_option_read, lines_areOptionsInTheirOrder) {
    EXPECT_OUTCOME(read("dhcp-option=tag:eth00,option:mtu,1500\n"
                        "dhcp-option=tag:other,option:ntp-server,1.1.1.1,2.2.2.2\n"
                        "dhcp-option=tag:eth00,option:root-path,/a \"b\" #c\n"
                        "dhcp-option=tag:eth00,option:mtu,1400"),
                   {.result = 1});
    EXPECT_EQ(
        (texts{"26 mtu [1500]", "42 ntp-server [] 1.1.1.1 2.2.2.2", "17 root-path [/a \"b\" #c]", "26 mtu [1400]"}),
        found);
}

TEST_F(dhcp_option_read, linesOfOtherKinds_arePassedOver) {
    EXPECT_OUTCOME(read("# dhcp-option=tag:x,option:mtu,1\n dhcp-option=tag:x,option:mtu,1\ndhcp-option=option:mtu,1\n"
                        "dhcp-option=vendor:x,1,2\nenable-ra\n\n\r\n"),
                   {.result = 1});
    EXPECT_EQ(texts{}, found);
}

TEST_F(dhcp_option_read, malformedLines_areLeftOutWithAWarning) {
    for (const std::string &line : texts{"dhcp-option=tag:", "dhcp-option=tag:eth00", "dhcp-option=tag:eth00,",
                                         "dhcp-option=tag:eth00,26,1", "dhcp-option=tag:a,option6:mtu,1"}) {
        EXPECT_OUTCOME(read(line + "\ndhcp-option=tag:eth00,option:mtu,1500\n"),
                       {.result = 1, .log = {malformed(line), warning(line)}});
        EXPECT_EQ((texts{"26 mtu [1500]"}), found);
    }
    for (const std::string &name : texts{"", "MTU", "mtu ", "vendor", "26", " mtu"}) {
        const std::string line = "dhcp-option=tag:eth00,option:" + name + ",1";
        EXPECT_OUTCOME(read(line + "\n"),
                       {.result = 1, .log = {kErr + "Unsupported dhcp option name [" + name + "]", warning(line)}});
    }
    const std::string bare = "dhcp-option=tag:eth00,option:mtu";
    EXPECT_OUTCOME(read(bare + "\n"), {.result = 1, .log = {warning(bare)}});
    const std::string invalid = "dhcp-option=tag:eth00,option:tcp-ttl,256";
    EXPECT_OUTCOME(
        read(invalid + "\n"),
        {.result = 1,
         .log = {"ERR dhcp_option_check:N wrong DHCP option number [37]: wrong string value [256]", warning(invalid)}});
    EXPECT_EQ(texts{}, found);
}

TEST_F(dhcp_option_read, overlongLine_isCutToItsRoom) {
    const std::string begin = "dhcp-option=tag:eth00,option:root-path,";
    EXPECT_OUTCOME(read(begin + long_text(5000, 'p') + "\ndhcp-option=tag:eth00,option:mtu,1500\n"), {.result = 1});
    EXPECT_EQ((texts{"17 root-path [" + long_text(1023 - begin.size(), 'p') + "]", "26 mtu [1500]"}), found);
}

TEST_F(dhcp_option_read, carriageReturns_areDropped) {
    EXPECT_OUTCOME(read("dhcp-option=tag:eth00,option:mtu,1500\r\ndhcp-option=tag:eth00,option:default-ttl,9\r"),
                   {.result = 1});
    EXPECT_EQ((texts{"26 mtu [1500]", "23 default-ttl [9]"}), found);
}

TEST_F(dhcp_option_read, binaryLines_doNoHarm) {
    const std::string begin = "dhcp-option=tag:eth00,option:root-path,";
    const outcome got = read(begin + std::string("a\0b\n", 4) + begin + "\xff\xfe\n" + std::string(3000, '\0') + "\n");
    EXPECT_EQ(1, got.result);
    EXPECT_EQ((texts{"17 root-path [a]", "17 root-path [\xff\xfe]"}), found);
}

TEST_F(dhcp_option_read, memoryThatRunsOut_isTold) {
    NEEDS_OWN_ALLOCATOR();
    const std::string gone = "ERR dhcp_conf:N Failed to get dhcp options from [" + kConf + "]";
    const std::string failed = "ERR dhcp_conf:N Failed to get DHCP Server config from [eth0, 0]";
    const auto told_when = [&](const char *operation, const std::string &message) {
        for (int nth = 1; nth < 60; ++nth) {
            rig.fail(operation, nth);
            const outcome got = read("dhcp-option=tag:eth00,option:ntp-server,1.1.1.1\n");
            if (got.log == texts{kErr + message, gone, failed}) {
                EXPECT_EQ(-1, got.result);
                return true;
            }
        }
        return false;
    };
    EXPECT_TRUE(told_when("KLIBCSzListAlloc", "Failed to alloc list when get user-defined dhcp option"));
    EXPECT_TRUE(told_when("KLIBCSzListAlloc", "KLIBCSzListAlloc() Failed"));
    EXPECT_TRUE(told_when("KLIBCSzListPush", "KLIBCSzListPush() Failed"));
    EXPECT_TRUE(told_when("calloc", "malloc failed"));
}
