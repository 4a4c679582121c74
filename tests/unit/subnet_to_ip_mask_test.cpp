#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

using converter = int (*)(char *, char *);

class subnet_to_ip_mask : public unit_test {
protected:
    /** Converts a text into an output of 64 bytes; afterwards the input has to be as before. */
    outcome convert(converter call, const std::string &text) {
        std::vector<char> in(text.c_str(), text.c_str() + text.size() + 1);
        std::vector<char> out(64);
        strcpy(out.data(), "before");
        const outcome got = rig.observe([&] { return call(in.data(), out.data()); });
        EXPECT_EQ(text, in.data());
        output = out.data();
        return got;
    }

    /** Converts a text in place, in a block of 64 bytes. */
    outcome convert_in_place(converter call, const std::string &text) {
        std::vector<char> in(64);
        strcpy(in.data(), text.c_str());
        const outcome got = rig.observe([&] { return call(in.data(), nullptr); });
        output = in.data();
        return got;
    }

    void expect_converted(converter call, const std::string &text, const std::string &expected) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(convert(call, text), {.result = 0});
        EXPECT_EQ(expected, output);
        EXPECT_OUTCOME(convert_in_place(call, text), {.result = 0});
        EXPECT_EQ(expected, output);
    }

    void expect_refused(converter call, const std::string &text) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(convert(call, text), {.result = -1, .code = 0x1000, .unit = "subnet_to_ip_mask"});
        EXPECT_EQ("before", output);
        if (text.size() < 64) {
            EXPECT_OUTCOME(convert_in_place(call, text), {.result = -1, .code = 0x1000, .unit = "subnet_to_ip_mask"});
            EXPECT_EQ(text, output);
        }
    }

    std::string output;
};

TEST_F(subnet_to_ip_mask, ErrKLIBSubnetToIpMask_subnet_givesNetworkAndMask) {
    const std::map<std::string, std::string> cases{
        {"192.168.1.77/24", "192.168.1.0/255.255.255.0"}, {"1.2.3.4/8", "1.0.0.0/255.0.0.0"},
        {"255.255.255.255/1", "128.0.0.0/128.0.0.0"},     {"255.255.255.255/32", "255.255.255.255/255.255.255.255"},
        {"0.0.0.0/31", "0.0.0.0/255.255.255.254"},        {"0x0a.012.0.1/0x10", "10.10.0.0/255.255.0.0"},
        {"10.0.0.1/ +030", "10.0.0.0/255.255.255.0"},
    };
    for (const auto &[text, expected] : cases) {
        expect_converted(ErrKLIBSubnetToIpMask, text, expected);
    }
}

TEST_F(subnet_to_ip_mask, ErrKLIBSubnetToIpMask_longestText_isConverted) {
    expect_converted(ErrKLIBSubnetToIpMask, "10.1.2.3/" + long_text(52, '0') + "10", "10.0.0.0/255.0.0.0");
}

TEST_F(subnet_to_ip_mask, ErrKLIBSubnetToIpMask_badAddress_isRefused) {
    for (const char *text :
         {"/24", "10.0.0/24", "10.0.0./24", "10.0.0.256/24", "256.0.0.0/24", "10.0.0.-1/24", "10.0.0.1.1/24", "abc/24",
          "10.0.0.1 /24", "10.0.0.1\n/24", "::1/64", "4294967306.0.0.1/24"}) {
        expect_refused(ErrKLIBSubnetToIpMask, text);
    }
}

TEST_F(subnet_to_ip_mask, ErrKLIBSubnetToIpMask_badPrefix_isRefused) {
    for (const char *text : {"10.0.0.1/", "10.0.0.1/0", "10.0.0.1/33", "10.0.0.1/-1", "10.0.0.1/24x", "10.0.0.1/24 ",
                             "10.0.0.1/24\n", "10.0.0.1/24/24", "10.0.0.1/x", "10.0.0.1/08", "10.0.0.1/4294967320",
                             "10.0.0.1/99999999999999999999", "10.0.0.1/255.255.255.0", "10.0.0.1//24"}) {
        expect_refused(ErrKLIBSubnetToIpMask, text);
    }
}

TEST_F(subnet_to_ip_mask, ErrKLIBSubnetToIpMask_overLongText_isRefused) {
    expect_refused(ErrKLIBSubnetToIpMask, "10.1.2.3/" + long_text(53, '0') + "10");
    expect_refused(ErrKLIBSubnetToIpMask, "10.1.2.3/24" + long_text(4096, ' '));
    expect_refused(ErrKLIBSubnetToIpMask, long_text(4096, '1') + "/24");
}

TEST_F(subnet_to_ip_mask, ErrKLIBSubnetToIpMask_nullOrNoSlash_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return ErrKLIBSubnetToIpMask(nullptr, nullptr); }),
                   refusal("subnet_to_ip_mask", "((void *)0) != szSubnet"));
    for (const std::string &text : {std::string(), std::string("10.0.0.1"), long_text(4096)}) {
        EXPECT_OUTCOME(convert(ErrKLIBSubnetToIpMask, text),
                       refusal("subnet_to_ip_mask", "((void *)0) != strchr(szSubnet, '/')"));
        EXPECT_EQ("before", output);
    }
}

TEST_F(subnet_to_ip_mask, ErrKLIBIpMaskToSubnet_addressAndMask_givesSubnet) {
    const std::map<std::string, std::string> cases{
        {"192.168.1.77/255.255.255.0", "192.168.1.0/24"}, {"1.2.3.4/255.0.0.0", "1.0.0.0/8"},
        {"255.255.255.255/128.0.0.0", "128.0.0.0/1"},     {"255.255.255.255/255.255.255.255", "255.255.255.255/32"},
        {"0x0a.012.0.1/0xff.0377.0.0", "10.10.0.0/16"},
    };
    for (const auto &[text, expected] : cases) {
        expect_converted(ErrKLIBIpMaskToSubnet, text, expected);
    }
}

TEST_F(subnet_to_ip_mask, ErrKLIBIpMaskToSubnet_badAddress_isRefused) {
    for (const char *text : {"/255.0.0.0", "10.0.0/255.0.0.0", "10.0.0./255.0.0.0", "10.0.0.256/255.0.0.0",
                             "10.0.0.-1/255.0.0.0", "abc/255.0.0.0", "10.0.0.1 /255.0.0.0"}) {
        expect_refused(ErrKLIBIpMaskToSubnet, text);
    }
}

TEST_F(subnet_to_ip_mask, ErrKLIBIpMaskToSubnet_badMask_isRefused) {
    for (const char *text :
         {"10.0.0.1/", "10.0.0.1/0.0.0.0", "10.0.0.1/255.0.255.0", "10.0.0.1/24", "10.0.0.1/255.255.255.",
          "10.0.0.1/255.255.255.256", "10.0.0.1/255.0.0.0/8", "10.0.0.1/255.0.0.0\n", "10.0.0.1/x"}) {
        expect_refused(ErrKLIBIpMaskToSubnet, text);
    }
}

TEST_F(subnet_to_ip_mask, ErrKLIBIpMaskToSubnet_overLongText_isRefused) {
    expect_refused(ErrKLIBIpMaskToSubnet, "10.1.2.3/255.255.255.0" + long_text(42, '0'));
    expect_refused(ErrKLIBIpMaskToSubnet, long_text(4096, '1') + "/255.0.0.0");
}

TEST_F(subnet_to_ip_mask, ErrKLIBIpMaskToSubnet_nullOrNoSlash_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return ErrKLIBIpMaskToSubnet(nullptr, nullptr); }),
                   refusal("subnet_to_ip_mask", "((void *)0) != szIpMask"));
    for (const std::string &text : {std::string(), std::string("10.0.0.1"), long_text(4096)}) {
        EXPECT_OUTCOME(convert(ErrKLIBIpMaskToSubnet, text),
                       refusal("subnet_to_ip_mask", "((void *)0) != strchr(szIpMask, '/')"));
        EXPECT_EQ("before", output);
    }
}

} // namespace
