#include "platform_test.h"

#include <filesystem>

#include <unistd.h>

#include "kova/service.h"

using namespace kova_test;

namespace {

constexpr const char *kScript = "/usr/kova/service/kova-test";
constexpr const char *kConfiguration = "/etc/kova/service/kova-test.conf";

class service : public platform_test {
protected:
    ~service() override {
        unlink(kScript);
        unlink(kConfiguration);
    }
    void install(const std::string &text) const { write_file(kScript, "#!/bin/sh\n" + text + "\n", 0755); }
};

const char *const kBadNames[] = {"", ".", "..", "../x", "a/b", "a b", "-x", "a\n", "$(x)"};

} // namespace

TEST_F(service, KLIBServiceReload_script_isRunWithTheVerb) {
    install("echo \"$@\" > " + path("out"));
    EXPECT_WORKS(KLIBServiceReload("kova-test"), 0);
    EXPECT_EQ(read_file(path("out")), "reload\n");
}

TEST_F(service, KLIBServiceReload_failure_isTold) {
    install("exit 3");
    EXPECT_FAILS(KLIBServiceReload("kova-test"), -1, 0x2A00);
    write_file(kScript, "#!/missing\n", 0755);
    EXPECT_FAILS(KLIBServiceReload("kova-test"), -1, 0x2A00);
    EXPECT_FAILS(KLIBServiceReload("kova-no-such-service"), -1, 0xBC00);
}

TEST_F(service, KLIBServiceIsRunning_status_decides) {
    install("[ \"$*\" = status ]");
    EXPECT_WORKS(KLIBServiceIsRunning("kova-test"), 1);
    install("exit 3");
    EXPECT_WORKS(KLIBServiceIsRunning("kova-test"), 0);
    EXPECT_WORKS(KLIBServiceIsRunning("kova-no-such-service"), 0);
}

TEST_F(service, KLIBServicectlJobStop_job_isStopped) {
    const kept_file keep{"/sbin/stop"};
    write_file("/sbin/stop", "#!/bin/sh\necho \"$@\" > " + path("out") + "\n", 0755);
    EXPECT_WORKS(KLIBServicectlJobStop("pppoerelay"), 0);
    EXPECT_EQ(read_file(path("out")), "pppoerelay\n");
    write_file("/sbin/stop", "#!/bin/sh\nexit 1\n", 0755);
    EXPECT_FAILS(KLIBServicectlJobStop("pppoerelay"), -1, 0x2A00);
    unlink("/sbin/stop");
    EXPECT_FAILS(KLIBServicectlJobStop("pppoerelay"), -1, 0x2A00);
}

TEST_F(service, KLIBServicecfgRunKeyGet_key_isRead) {
    int run = 7;
    EXPECT_FAILS(KLIBServicecfgRunKeyGet("kova-test", &run), -1, 0x900);
    EXPECT_EQ(run, 7);
    write_file(kConfiguration, "run=\"yes\"\n");
    EXPECT_WORKS(KLIBServicecfgRunKeyGet("kova-test", &run), 0);
    EXPECT_EQ(run, 1);
    write_file(kConfiguration, "run=no\n");
    EXPECT_WORKS(KLIBServicecfgRunKeyGet("kova-test", &run), 0);
    EXPECT_EQ(run, 2);
    write_file(kConfiguration, "other=yes\n");
    EXPECT_WORKS(KLIBServicecfgRunKeyGet("kova-test", &run), 0);
    EXPECT_EQ(run, 2);
    EXPECT_FAILS(KLIBServicecfgRunKeyGet("kova-test", nullptr), -1, 0xD00);
}

TEST_F(service, KLIBServicecfgRunKeySet_key_isReadBack) {
    for (const int wanted : {1, 2, 1}) {
        int run = 0;
        EXPECT_WORKS(KLIBServicecfgRunKeySet("kova-test", wanted), 0);
        EXPECT_WORKS(KLIBServicecfgRunKeyGet("kova-test", &run), 0);
        EXPECT_EQ(run, wanted);
    }
    EXPECT_EQ(read_file(kConfiguration), "run=yes\n");
    write_file(kConfiguration, "# mine\nrun=no\nother=yes\n");
    EXPECT_WORKS(KLIBServicecfgRunKeySet("kova-test", 1), 0);
    EXPECT_EQ(read_file(kConfiguration), "# mine\nrun=yes\nother=yes\n");
    for (const int wrong : {0, 3, -1})
        EXPECT_FAILS(KLIBServicecfgRunKeySet("kova-test", wrong), -1, 0xD00);
    EXPECT_EQ(read_file(kConfiguration), "# mine\nrun=yes\nother=yes\n");
}

TEST_F(service, KLIBService_badNames_areRefused) {
    int run = 0;
    for (const char *name : kBadNames) {
        EXPECT_FAILS(KLIBServiceReload(name), -1, 0xD00);
        EXPECT_FAILS(KLIBServiceIsRunning(name), -1, 0xD00);
        EXPECT_FAILS(KLIBServicectlJobStop(name), -1, 0xD00);
        EXPECT_FAILS(KLIBServicecfgRunKeyGet(name, &run), -1, 0xD00);
        EXPECT_FAILS(KLIBServicecfgRunKeySet(name, 1), -1, 0xD00);
    }
    EXPECT_FAILS(KLIBServiceReload(nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBServiceIsRunning(std::string(65, 'x').c_str()), -1, 0xD00);
}
