#include "support/rig.h"

#include <kovanetsdk/dhcp.h>

using namespace kova_test;

namespace {

const std::string kFragment = "/etc/dhcpd/dhcpd-vendor.conf";
const std::string kUnit = "ERR dhcp_vendor_check_opt_num:N ";
const std::string kWarning = "WARNING dhcp_vendor_check_opt_num:N ";
const texts kMkdir{"/bin/mkdir -p /etc/dhcpd"};
const std::string kTwoVendors = "dhcp-option=vendor:MSFT,1,one\n"
                                "dhcp-option=vendor:PXEClient,43,boot\n"
                                "dhcp-option=vendor:MSFT,2,two\n"
                                "dhcp-option=vendor:MSFT2,1,other\n";

} // namespace

class dhcp_vendor_check_opt_num : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        shell("rm -rf /etc/dhcpd && mkdir /etc/dhcpd");
        options = KLIBCSzHashAlloc(16);
        vendors = KLIBCSzListAlloc(16);
    }
    void TearDown() override {
        KLIBCSzHashFree(options);
        KLIBCSzListFree(vendors);
        shell("rm -rf /etc/dhcpd");
        unit_test::TearDown();
    }
    void add(const std::string &number, const std::string &text) {
        ASSERT_EQ(0, KLIBCSzHashSetValue(options, number.c_str(), text.c_str()));
    }
    outcome get(const char *vendor) {
        return rig.observe([&] { return DHCPVendorGetVendor(vendor, &options); });
    }
    outcome get_option(const char *vendor, int number, unsigned size = 64) {
        strcpy(value, "untouched");
        return rig.observe([=, this] { return DHCPVendorGetVendorOpt(vendor, number, value, size); });
    }
    outcome set(const char *vendor) {
        return rig.observe([&] { return DHCPVendorSetVendor(vendor, options); });
    }
    outcome set_option(const char *vendor, int number, const char *text) {
        return rig.observe([=] { return DHCPVendorSetVendorOpt(vendor, number, text); });
    }
    outcome enumerate() {
        return rig.observe([&] { return DHCPVendorEnum(&vendors); });
    }
    /** "number=value" of the map, in its order. */
    texts content() {
        KLIBSZLIST *keys = KLIBCSzListAlloc(16);
        KLIBCSzHashEnumKey(options, keys);
        texts pairs;
        for (int i = 0; KLIBCSzListGet(keys, i) != nullptr; ++i) {
            const std::string key = KLIBCSzListGet(keys, i);
            pairs.push_back(key + "=" + KLIBCSzHashGetValue(options, key.c_str()));
        }
        KLIBCSzListFree(keys);
        return pairs;
    }
    texts found() {
        texts all;
        for (int i = 0; KLIBCSzListGet(vendors, i) != nullptr; ++i) {
            all.emplace_back(KLIBCSzListGet(vendors, i));
        }
        return all;
    }

    KLIBSZHASH *options = nullptr;
    KLIBSZLIST *vendors = nullptr;
    char value[64] = "";
};

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorCheckOptNum_digitsFrom1To254_areValid) {
    for (const std::string &number : texts{"1", "254", "043", "00001"}) {
        EXPECT_EQ(1, DHCPVendorCheckOptNum(number.c_str())) << number;
    }
    for (const std::string &number : texts{"", "0", "255", "12a", "a12", " 1", "1 ", "-1", "+1", "0x1", "1.0", "1\n",
                                           "4294967297", "18446744073709551617", long_text(4096, '1')}) {
        EXPECT_EQ(0, DHCPVendorCheckOptNum(number.c_str())) << number;
    }
    EXPECT_EQ(0, DHCPVendorCheckOptNum(nullptr));
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorGetVendor_options_areAddedToTheMap) {
    write_file(kFragment, kTwoVendors);
    add("9", "mine");
    add("2", "old");
    EXPECT_OUTCOME(get("MSFT"), {.result = 0});
    EXPECT_EQ((texts{"9=mine", "2=two", "1=one"}), content());
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorGetVendor_missingFragmentOrVendor_changesNothing) {
    add("9", "mine");
    EXPECT_OUTCOME(get("MSFT"), {.result = 0});
    write_file(kFragment, kTwoVendors);
    for (const std::string &vendor : texts{"MSF", "msft", "", long_text(4096)}) {
        EXPECT_OUTCOME(get(vendor.c_str()), {.result = 0});
    }
    EXPECT_EQ(texts{"9=mine"}, content());
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorGetVendor_missingArgument_isToldAndGoesOn) {
    const texts told{kUnit + "Failed to get vendor option: parameter error"};
    EXPECT_OUTCOME(get(nullptr), {.result = 0, .log = told});
    EXPECT_OUTCOME(rig.observe([] { return DHCPVendorGetVendor("MSFT", nullptr); }), {.result = 0, .log = told});

    write_file(kFragment, kTwoVendors);
    EXPECT_OUTCOME(get(nullptr), {.result = 0, .log = told});
    KLIBSZHASH *none = nullptr;
    const outcome cannot_add{.result = -1,
                             .code = 0xD00,
                             .unit = "sz_hash",
                             .log = {told[0], kUnit + "Failed to get vendor option: generate vendor hash error"}};
    EXPECT_OUTCOME(rig.observe([&] { return DHCPVendorGetVendor("MSFT", &none); }), cannot_add);
    EXPECT_OUTCOME(rig.observe([] { return DHCPVendorGetVendor("MSFT", nullptr); }), cannot_add);
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorGetVendor_lineOfWrongFormat_endsTheScan) {
    const auto refused = [&](const std::string &line, const std::string &reason) {
        write_file(kFragment, "dhcp-option=vendor:MSFT,1,one\n" + line + "\ndhcp-option=vendor:MSFT,2,two\n");
        KLIBCSzHashFree(options);
        options = KLIBCSzHashAlloc(16);
        EXPECT_OUTCOME(get("MSFT"), {.result = -1, .log = {kUnit + reason}});
        EXPECT_EQ(texts{"1=one"}, content());
    };
    for (const std::string &line :
         texts{"#dhcp-option=vendor:MSFT,3,x", "dhcp-option=vendor:MSFT,3", "dhcp-option=vendor:MSFT,3,a,b"}) {
        refused(line, "vendor opt line [" + line + "] has wrong format");
    }
    refused("dhcp-option=vendor:MSFT,255,x", "Wrong option number [255]");
    refused("dhcp-option=vendor:MSFT,,x", "Wrong option number []");
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorGetVendor_overlongLine_isCut) {
    write_file(kFragment, "dhcp-option=vendor:MSFT,1," + long_text(5000, 'v') + "\ndhcp-option=vendor:MSFT,2,two\n");
    EXPECT_OUTCOME(get("MSFT"), {.result = 0});
    EXPECT_EQ((texts{"1=" + long_text(1023 - 26, 'v'), "2=two"}), content());
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorGetVendor_fragmentThatCannotBeRead_isTold) {
    write_file(kFragment, kTwoVendors);
    rig.fail("fopen");
    EXPECT_OUTCOME(get("MSFT"), {.result = -1, .log = {kUnit + "Failed to read DHCP vendor config"}});
    rig.redirect(kFragment, "/proc/self/mem"); // opens, and cannot be read at its beginning
    EXPECT_OUTCOME(get("MSFT"), {.result = -1, .log = {kUnit + "Failed to read DHCP vendor config"}});
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorGetVendor_noMemory_isTold) {
    write_file(kFragment, kTwoVendors);
    rig.fail("KLIBCSzListAlloc");
    EXPECT_EQ(texts{kUnit + "Failed to alloc memory when parse vendor opt line [dhcp-option=vendor:MSFT,1,one]"},
              get("MSFT").log);
    rig.fail("KLIBCSzHashSetValue");
    EXPECT_EQ(texts{kUnit + "Failed to get vendor option: generate vendor hash error"}, get("MSFT").log);
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorGetVendorOpt_option_isRead) {
    write_file(kFragment, kTwoVendors);
    EXPECT_OUTCOME(get_option("MSFT", 2), {.result = 1});
    EXPECT_STREQ("two", value);
    EXPECT_OUTCOME(get_option("PXEClient", 43, 4), {.result = 1});
    EXPECT_STREQ("boo", value);
    EXPECT_OUTCOME(get_option("PXEClient", 43, 1), {.result = 1});
    EXPECT_STREQ("", value);
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorGetVendorOpt_missing_isZero) {
    EXPECT_OUTCOME(get_option("MSFT", 1), {.result = 0});
    write_file(kFragment, kTwoVendors);
    for (const int number : {3, 12, 254}) {
        EXPECT_OUTCOME(get_option("MSFT", number),
                       {.result = 0,
                        .log = {"DEBUG dhcp_vendor_check_opt_num:N No match [dhcp-option=vendor:MSFT," +
                                std::to_string(number) + "] line in DHCP vendor config"}});
    }
    EXPECT_OUTCOME(get_option(long_text(4096).c_str(), 1), {.result = 0});
    EXPECT_STREQ("untouched", value);
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorGetVendorOpt_badArguments_areTold) {
    write_file(kFragment, kTwoVendors);
    const auto told = [](const std::string &vendor, int number) {
        return outcome{.result = -1,
                       .log = {kUnit + "get vendor [" + vendor + "] option [#" + std::to_string(number) +
                               "] failed: wrong input format"}};
    };
    EXPECT_OUTCOME(get_option(nullptr, 1), told("", 1));
    EXPECT_OUTCOME(get_option("", 1), told("", 1));
    for (const int number : {0, 255, -1}) {
        EXPECT_OUTCOME(get_option("MSFT", number), told("MSFT", number));
    }
    EXPECT_OUTCOME(rig.observe([] { return DHCPVendorGetVendorOpt("MSFT", 1, nullptr, 9); }), told("MSFT", 1));
    EXPECT_OUTCOME(
        get_option("MSFT", 1, 0),
        {.result = -1,
         .log = {kUnit + "Failed to parse vendor opt line [dhcp-option=vendor:MSFT,1,one], parameter error"}});
    EXPECT_STREQ("untouched", value);
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorGetVendorOpt_valueWithComma_cannotBeRead) {
    write_file(kFragment, "dhcp-option=vendor:MSFT,1,a,b\n");
    EXPECT_OUTCOME(get_option("MSFT", 1),
                   {.result = -1, .log = {kUnit + "vendor opt line [dhcp-option=vendor:MSFT,1,a,b] has wrong format"}});
    EXPECT_STREQ("untouched", value);
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorGetVendorOpt_lookupFails_isTold) {
    write_file(kFragment, kTwoVendors);
    rig.fail("KLIBCFileGetLine");
    outcome got = get_option("MSFT", 1);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(texts{kUnit + "KLIBCFileGetLine() failed"}, got.log);
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorSetVendor_options_replaceTheOldOnes) {
    write_file(kFragment, kTwoVendors);
    add("6", "six");
    add("43", "x y");
    EXPECT_OUTCOME(set("MSFT"), {.result = 0, .commands = kMkdir});
    EXPECT_EQ("dhcp-option=vendor:PXEClient,43,boot\ndhcp-option=vendor:MSFT2,1,other\n"
              "dhcp-option=vendor:MSFT,6,six\ndhcp-option=vendor:MSFT,43,x y\n",
              read_file(kFragment));
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorSetVendor_missingFragment_isMade) {
    shell("rm -r /etc/dhcpd");
    add("6", "six");
    EXPECT_OUTCOME(set("MSFT"), {.result = 0, .commands = kMkdir});
    EXPECT_EQ("dhcp-option=vendor:MSFT,6,six\n", read_file(kFragment));
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorSetVendor_emptyMap_removesTheOptions) {
    write_file(kFragment, kTwoVendors);
    EXPECT_OUTCOME(set("MSFT"), {.result = 0, .commands = kMkdir});
    EXPECT_EQ("dhcp-option=vendor:PXEClient,43,boot\ndhcp-option=vendor:MSFT2,1,other\n", read_file(kFragment));
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorSetVendor_wrongNumber_failsAfterTheOldLinesWent) {
    write_file(kFragment, kTwoVendors);
    add("6", "six");
    add("300", "x");
    add("7", "seven");
    EXPECT_OUTCOME(set("MSFT"), {.result = -1,
                                 .log = {kUnit + "Failed to set vendor [MSFT] option, Wrong option number [300]"},
                                 .commands = kMkdir});
    EXPECT_EQ("dhcp-option=vendor:PXEClient,43,boot\ndhcp-option=vendor:MSFT2,1,other\n"
              "dhcp-option=vendor:MSFT,6,six\n",
              read_file(kFragment));
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorSetVendor_badArguments_changeNothing) {
    write_file(kFragment, kTwoVendors);
    const auto told = [](const std::string &vendor) {
        return outcome{.result = -1, .log = {kUnit + "Failed to set vendor [" + vendor + "] option: parameter error"}};
    };
    add("6", "six");
    EXPECT_OUTCOME(set(nullptr), told(""));
    for (const std::string &vendor : texts{"", "A\nB", "MSFT,1", "\x01", long_text(1024), long_text(4096)}) {
        EXPECT_OUTCOME(set(vendor.c_str()), told(vendor));
    }
    EXPECT_OUTCOME(rig.observe([] { return DHCPVendorSetVendor("MSFT", nullptr); }), told("MSFT"));
    for (const std::string &text : texts{"a\ninterface=eth9", "a\rb", long_text(1023), long_text(4096)}) {
        add("6", text);
        EXPECT_OUTCOME(set("MSFT"), told("MSFT"));
    }
    EXPECT_EQ(kTwoVendors, read_file(kFragment));
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorSetVendor_failures_areTold) {
    write_file(kFragment, kTwoVendors);
    add("6", "six");
    const auto failing = [&](const std::string &operation, const std::string &reason) {
        rig.fail(operation);
        outcome got = set("MSFT");
        EXPECT_LT(got.result, 0);
        EXPECT_EQ(texts{kUnit + reason}, got.log);
    };
    failing("KLIBCSzListAlloc", "Failed to set vendor [MSFT] option: KLIBCSzListAlloc() error");
    failing("KLIBCSzHashEnumKey", "Failed to set vendor [MSFT] option: KLIBCSzHashEnumKey() error");
    failing("KLIBCFileRemoveKey", "Failed to set vendor [MSFT] option: remove old config");
    EXPECT_EQ(kTwoVendors, read_file(kFragment));
    failing("KLIBCFileAddLine", "Faild to set vendor [MSFT] option: KLIBCFileAddLine() erorr");

    shell("rm -r /etc/dhcpd && touch /etc/dhcpd");
    EXPECT_OUTCOME(set("MSFT"), {.result = -1, .log = {kUnit + "Failed to mkdir [/etc/dhcpd]"}, .commands = kMkdir});
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorSetVendorOpt_option_isReplaced) {
    write_file(kFragment, kTwoVendors + "dhcp-option=vendor:MSFT,12,twelve\n");
    EXPECT_OUTCOME(set_option("MSFT", 1, "new"), {.result = 0, .commands = kMkdir});
    EXPECT_EQ("dhcp-option=vendor:PXEClient,43,boot\ndhcp-option=vendor:MSFT,2,two\n"
              "dhcp-option=vendor:MSFT2,1,other\ndhcp-option=vendor:MSFT,12,twelve\n"
              "dhcp-option=vendor:MSFT,1,new\n",
              read_file(kFragment));
    EXPECT_OUTCOME(get_option("MSFT", 1), {.result = 1});
    EXPECT_STREQ("new", value);
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorSetVendorOpt_longestLine_isReadBack) {
    const std::string longest = long_text(1023 - 26, 'v');
    EXPECT_OUTCOME(set_option("MSFT", 1, longest.c_str()), {.result = 0, .commands = kMkdir});
    EXPECT_OUTCOME(get("MSFT"), {.result = 0});
    EXPECT_EQ(texts{"1=" + longest}, content());
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorSetVendorOpt_badArguments_areToldAndWritten) {
    const auto told = [](const std::string &vendor, int number) {
        return outcome{.result = 0,
                       .log = {kUnit + "Failed to set vendor [" + vendor + "] option [#" + std::to_string(number) +
                               "]: parameter error"},
                       .commands = kMkdir};
    };
    EXPECT_OUTCOME(set_option("", 1, "a"), told("", 1));
    EXPECT_OUTCOME(set_option(nullptr, 2, "b"), told("", 2));
    EXPECT_OUTCOME(set_option("V", 3, ""), told("V", 3));
    EXPECT_OUTCOME(set_option("V", 4, nullptr), told("V", 4));
    EXPECT_OUTCOME(set_option("V", 0, "c"), told("V", 0));
    EXPECT_OUTCOME(set_option("V", 255, "d"), told("V", 255));
    EXPECT_EQ("dhcp-option=vendor:,1,a\ndhcp-option=vendor:,2,b\ndhcp-option=vendor:V,3,\n"
              "dhcp-option=vendor:V,4,\ndhcp-option=vendor:V,0,c\ndhcp-option=vendor:V,255,d\n",
              read_file(kFragment));
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorSetVendorOpt_textThatIsNoField_changesNothing) {
    write_file(kFragment, kTwoVendors);
    const auto told = [](const std::string &vendor) {
        return outcome{.result = -1,
                       .log = {kUnit + "Failed to set vendor [" + vendor + "] option [#1]: parameter error"}};
    };
    for (const std::string &text : texts{"a\ninterface=eth9", "a\rb", "\x1b", long_text(1023), long_text(4096)}) {
        EXPECT_OUTCOME(set_option("MSFT", 1, text.c_str()), told("MSFT"));
    }
    for (const std::string &vendor : texts{"A\nB", "MSFT,1", long_text(1024)}) {
        EXPECT_OUTCOME(set_option(vendor.c_str(), 1, "x"), told(vendor));
    }
    EXPECT_EQ(kTwoVendors, read_file(kFragment));
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorSetVendorOpt_failures_areTold) {
    write_file(kFragment, kTwoVendors);
    rig.fail("KLIBCFileRemoveKey");
    EXPECT_EQ(texts{kUnit + "Failed to set vendor [MSFT] option [#1]: remove old config"},
              set_option("MSFT", 1, "x").log);
    EXPECT_EQ(kTwoVendors, read_file(kFragment));
    rig.fail("KLIBCFileAddLine");
    outcome got = set_option("MSFT", 1, "x");
    EXPECT_LT(got.result, 0);
    EXPECT_EQ(texts{kUnit + "Faild to set vendor [MSFT] option [#1]: KLIBCFileAddLine() erorr"}, got.log);

    shell("rm -r /etc/dhcpd && touch /etc/dhcpd");
    EXPECT_OUTCOME(set_option("MSFT", 1, "x"),
                   {.result = -1, .log = {kUnit + "Failed to mkdir [/etc/dhcpd]"}, .commands = kMkdir});
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorEnum_vendors_comeOnceInFileOrder) {
    write_file(kFragment, kTwoVendors);
    EXPECT_OUTCOME(enumerate(), {.result = 0});
    EXPECT_EQ((texts{"MSFT", "PXEClient", "MSFT2"}), found());
    EXPECT_OUTCOME(enumerate(), {.result = 0});
    EXPECT_EQ((texts{"MSFT", "PXEClient", "MSFT2"}), found());
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorEnum_otherLines_arePassedOver) {
    EXPECT_OUTCOME(enumerate(), {.result = 0});
    write_file(kFragment, "# comment\ndhcp-option=tag:a,option:router,1\n\x01\x02\n");
    EXPECT_OUTCOME(enumerate(), {.result = 0});
    EXPECT_EQ(texts{}, found());
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorEnum_lineWithoutVendor_isToldAndPassedOver) {
    write_file(kFragment, "dhcp-option=vendor:,1,a\ndhcp-option=vendor:\ndhcp-option=vendor:V,1,a\n");
    EXPECT_OUTCOME(enumerate(), {.result = 0,
                                 .log = {kWarning + "wrong format [dhcp-option=vendor:,1,a] in DHCP vendor config",
                                         kWarning + "wrong format [dhcp-option=vendor:] in DHCP vendor config"}});
    EXPECT_EQ(texts{"V"}, found());
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendor_whatIsNoFile_cannotBeRead) {
    shell("mkdir -p " + std::string(kFragment));
    const outcome unreadable{.result = -1, .log = {kUnit + "Failed to read DHCP vendor config"}};
    EXPECT_OUTCOME(enumerate(), unreadable);
    EXPECT_OUTCOME(get("V"), unreadable);
}

TEST_F(dhcp_vendor_check_opt_num, DHCPVendorEnum_failures_areTold) {
    const outcome refused{.result = -1, .log = {kUnit + "Failed to enum vendors: parameter error"}};
    EXPECT_OUTCOME(rig.observe([] { return DHCPVendorEnum(nullptr); }), refused);
    KLIBSZLIST *none = nullptr;
    EXPECT_OUTCOME(rig.observe([&] { return DHCPVendorEnum(&none); }), refused);

    write_file(kFragment, kTwoVendors);
    rig.fail("fopen");
    EXPECT_OUTCOME(enumerate(), {.result = -1, .log = {kUnit + "Failed to read DHCP vendor config"}});
    rig.redirect(kFragment, "/proc/self/mem"); // opens, and cannot be read at its beginning
    EXPECT_OUTCOME(enumerate(), {.result = -1, .log = {kUnit + "Failed to read DHCP vendor config"}});
    rig.redirect(kFragment, kFragment);
    rig.fail("KLIBCSzListPush");
    outcome got = enumerate();
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(texts{kUnit + "Failed to add vendor [MSFT] to list"}, got.log);
}
