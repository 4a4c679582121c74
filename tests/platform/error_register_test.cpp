#include "platform_test.h"

#include <thread>

using namespace kova_test;

TEST(error_register, KLIBCErrGet_freshThread_hasNoError) {
    std::thread{[] {
        EXPECT_EQ(KLIBCErrGet(), 0U);
        EXPECT_STREQ(KLIBCErrorGetFile(), "");
        EXPECT_EQ(KLIBCErrorGetLine(), 0);
    }}.join();
}

TEST(error_register, KLIBCErrSetEx_values_areReadBack) {
    KLIBCErrSetEx(0x81234500, "net_set_ip", 77);
    EXPECT_EQ(KLIBCErrGet(), 0x81234500U);
    EXPECT_STREQ(KLIBCErrorGetFile(), "net_set_ip");
    EXPECT_EQ(KLIBCErrorGetLine(), 77);
}

TEST(error_register, KLIBCErrSetEx_noUnit_readsAsEmpty) {
    KLIBCErrSetEx(0xD00, nullptr, 1);
    EXPECT_STREQ(KLIBCErrorGetFile(), "");
}

TEST(error_register, KLIBCErrSetEx_threads_haveTheirOwn) {
    KLIBCErrSetEx(0x200, "here", 1);
    std::thread{[] { KLIBCErrSetEx(0x900, "there", 2); }}.join();
    EXPECT_EQ(KLIBCErrGet(), 0x200U);
    EXPECT_STREQ(KLIBCErrorGetFile(), "here");
}

TEST(error_register, KLIBCErrGet_platformFailure_namesItsUnit) {
    EXPECT_EQ(KLIBCFileRemoveKey(nullptr, "key"), -1);
    EXPECT_EQ(KLIBCErrGet(), 0xD00U);
    EXPECT_STREQ(KLIBCErrorGetFile(), "key_value");
    EXPECT_GT(KLIBCErrorGetLine(), 0);
}
