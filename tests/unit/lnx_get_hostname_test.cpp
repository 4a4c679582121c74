#include "support/rig.h"

#include <cerrno>
#include <cstring>
#include <kovanetsdk/hostname.h>
#include <unistd.h>

using namespace kova_test;

namespace {

const texts kLocked{"+0x105", "-0x100"};

class lnx_get_hostname : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        ASSERT_EQ(0, gethostname(before_, sizeof before_));
    }
    void TearDown() override {
        unit_test::TearDown();
        EXPECT_EQ(0, sethostname(before_, strlen(before_)));
    }
    static void set_kernel_name(const std::string &name) { ASSERT_EQ(0, sethostname(name.c_str(), name.size())); }
    outcome get() {
        memset(name_, '#', sizeof name_);
        return rig.observe([this] { return KOVALnxGetHostname(name_); });
    }
    /** The name that was copied; no byte behind the 64 of the caller may have changed. */
    std::string name() const {
        EXPECT_EQ('#', name_[64]);
        return name_;
    }

    char name_[66] = "";

private:
    char before_[256] = "";
};

TEST_F(lnx_get_hostname, KOVALnxGetHostname_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVALnxGetHostname(nullptr); }),
                   refusal("lnx_get_hostname", "((void *)0) != szHostname"));
}

TEST_F(lnx_get_hostname, KOVALnxGetHostname_name_isCopied) {
    for (const std::string &known : {std::string("nas"), std::string("a"), long_text(63)}) {
        set_kernel_name(known);
        EXPECT_OUTCOME(get(), {.result = 1, .locks = kLocked});
        EXPECT_EQ(known, name());
    }
}

TEST_F(lnx_get_hostname, KOVALnxGetHostname_domain_isCutAtTheFirstDot) {
    for (const char *known : {"nas.example.com", "nas.", "nas..", "nas.\n"}) {
        set_kernel_name(known);
        EXPECT_OUTCOME(get(), {.result = 1, .locks = kLocked});
        EXPECT_EQ("nas", name());
    }
}

TEST_F(lnx_get_hostname, KOVALnxGetHostname_nothingLeft_isNoName) {
    for (const char *known : {"", ".", ".example.com"}) {
        set_kernel_name(known);
        EXPECT_OUTCOME(get(), {.result = 0, .locks = kLocked});
        EXPECT_EQ("", name());
    }
}

TEST_F(lnx_get_hostname, KOVALnxGetHostname_sixtyFourCharacters_fails) {
    for (const std::string &known : {long_text(64), "nas." + long_text(60)}) {
        set_kernel_name(known);
        EXPECT_OUTCOME(get(), {.result = -1, .code = 0x8100, .unit = "lnx_get_hostname", .locks = kLocked});
        EXPECT_EQ(std::string(66, '#'), std::string(name_, 66)) << "the caller's buffer is not touched";
    }
}

TEST_F(lnx_get_hostname, KOVALnxGetHostname_kernelRefuses_fails) {
    rig.answer_gethostname([](char *, size_t) {
        errno = EFAULT;
        return -1;
    });
    EXPECT_OUTCOME(get(), {.result = -1, .code = 0x8100, .unit = "lnx_get_hostname", .locks = kLocked});
}

TEST_F(lnx_get_hostname, KOVALnxGetHostname_cutNameThatShowsInErrnoAlone_fails) {
    rig.answer_gethostname([](char *name, size_t size) {
        strncpy(name, "nas", size);
        errno = ENAMETOOLONG;
        return 0;
    });
    EXPECT_OUTCOME(get(), {.result = -1, .code = 0x8100, .unit = "lnx_get_hostname", .locks = kLocked});
}

TEST_F(lnx_get_hostname, KOVALnxGetHostname_errnoOfTheCaller_meansNothing) {
    set_kernel_name("nas");
    errno = ENAMETOOLONG;
    EXPECT_OUTCOME(get(), {.result = 1, .locks = kLocked});
    EXPECT_EQ("nas", name());
}

TEST_F(lnx_get_hostname, KOVALnxGetHostname_nameWithoutTerminator_isTerminated) {
    rig.answer_gethostname([](char *name, size_t size) {
        EXPECT_EQ(64U, size);
        memset(name, 'x', size);
        return 0;
    });
    EXPECT_OUTCOME(get(), {.result = 1, .locks = kLocked});
    EXPECT_EQ(long_text(63, 'x'), name());
}

TEST_F(lnx_get_hostname, KOVALnxGetHostname_lockHeldElsewhere_fails) {
    const lock_elsewhere other{0x106};
    outcome got = get();
    EXPECT_FALSE(got.sleeps.empty());
    got.sleeps.clear();
    EXPECT_OUTCOME(got, {.result = -1,
                         .code = 0x400,
                         .unit = "lnx_get_hostname",
                         .log = {"ERR lnx_get_hostname:N KLIBCFileLock() failed.(400)"}});
}

TEST_F(lnx_get_hostname, KOVALnxGetHostname_otherReaders_areLetIn) {
    set_kernel_name("nas");
    const lock_elsewhere other{0x105};
    EXPECT_OUTCOME(get(), {.result = 1, .locks = kLocked});
}

} // namespace
