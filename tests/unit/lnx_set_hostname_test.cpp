#include "support/rig.h"

#include <cstring>
#include <filesystem>
#include <kova/core.h>
#include <kovanetsdk/hostname.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

using namespace kova_test;

namespace {

const std::string kHostname = "/etc/hostname";
const std::string kHosts = "/etc/hosts";
const texts kLocked{"+0x106", "-0x100"};
const texts kReload{"/sbin/initctl reload syslog-ng"};

std::string hosts_of(const std::string &name) {
    return "# Any manual change will be lost if the host name is changed or system upgrades.\n"
           "127.0.0.1\tlocalhost\n"
           "::1\t\tlocalhost\n"
           "127.0.0.1\t" +
           name + "\n::1\t\t" + name + "\n";
}

std::string kernel_name() {
    char name[256] = "";
    EXPECT_EQ(0, gethostname(name, sizeof name));
    return name;
}

outcome success(const std::string &name) {
    return {.result = 0, .commands = kReload, .events = {"net/hostname_change 5 HOSTNAME=" + name}, .locks = kLocked};
}

outcome failure(unsigned code, const texts &log = {}, const texts &commands = {}) {
    return {.result = -1,
            .code = code,
            .unit = code != 0 ? "lnx_set_hostname" : "",
            .log = log,
            .commands = commands,
            .locks = kLocked};
}

/** Another file system over a directory while this lives. */
class mounted {
public:
    mounted(const char *where, const char *options, unsigned long flags = 0) : where_(where) {
        EXPECT_EQ(0, mount("tmpfs", where, "tmpfs", flags, options)) << strerror(errno);
    }
    mounted(const mounted &) = delete;
    mounted &operator=(const mounted &) = delete;
    ~mounted() { EXPECT_EQ(0, umount(where_)) << strerror(errno); }
    void make_read_only() const {
        EXPECT_EQ(0, mount("tmpfs", where_, "tmpfs", MS_REMOUNT | MS_RDONLY, nullptr)) << strerror(errno);
    }

private:
    const char *where_;
};

class lnx_set_hostname : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        before_ = kernel_name();
        std::filesystem::remove_all(kHostname);
        std::filesystem::remove_all(kHosts);
        write_file(kHostname, "old\n");
        write_file(kHosts, hosts_of("old"));
        ASSERT_EQ(0, sethostname("old", 3));
        etc_ = list_dir("/etc");
    }
    void TearDown() override {
        EXPECT_EQ(etc_, list_dir("/etc")) << "nothing stays beside the files";
        unit_test::TearDown();
        EXPECT_EQ(0, sethostname(before_.c_str(), before_.size()));
    }
    outcome set(const std::string &name) {
        return rig.observe([&] { return KOVALnxSetHostname(name.c_str()); });
    }
    /** The name in the kernel, and those the two files are made of. */
    static void expect_names(const std::string &kernel, const std::string &hostname, const std::string &hosts) {
        EXPECT_EQ(kernel, kernel_name());
        EXPECT_EQ(hostname + "\n", read_file(kHostname));
        EXPECT_EQ(hosts_of(hosts), read_file(kHosts));
    }

    texts etc_;

private:
    std::string before_;
};

mode_t mode_of(const std::string &path) {
    struct stat status {};
    EXPECT_EQ(0, stat(path.c_str(), &status));
    return status.st_mode & 07777;
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_missingName_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVALnxSetHostname(nullptr); }),
                   refusal("lnx_set_hostname", "((void *)0) != szHostname"));
    EXPECT_OUTCOME(set(""), refusal("lnx_set_hostname", "'\\0' != *szHostname"));
    expect_names("old", "old", "old");
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_name_isSetEverywhere) {
    for (const std::string &name : {std::string("n"), std::string("nas01"), long_text(63)}) {
        EXPECT_OUTCOME(set(name), success(name));
        expect_names(name, name, name);
    }
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_overlongName_isOutOfRange) {
    for (const size_t length : {64U, 65U, 4096U}) {
        EXPECT_OUTCOME(set(long_text(length)), {.result = -1, .code = 0xE00, .unit = "lnx_set_hostname"});
    }
    expect_names("old", "old", "old");
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_characters_areNotLookedAt) {
    for (const std::string &name : texts{"nas.example.com", "%s%n", "two words", "-", "\x01\x7f\xff", "a/b"}) {
        EXPECT_OUTCOME(set(name), success(name));
        expect_names(name, name, name);
    }
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_newline_failsAtTheEvent) {
    outcome expected = failure(0xD00, {"ERR KLIBPluginSetArg failed, hostname = a\nb"}, kReload);
    expected.unit = "plugin";
    EXPECT_OUTCOME(set("a\nb"), expected);
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_foreignLines_areLost) {
    for (const std::string &content : {std::string(), std::string("192.168.1.2 other\n# mine\nno newline at the end"),
                                       long_text(1000000), std::string("\0\xff\n", 3)}) {
        write_file(kHosts, content);
        write_file(kHostname, content);
        EXPECT_OUTCOME(set("nas"), success("nas"));
        expect_names("nas", "nas", "nas");
    }
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_missingFiles_areMade) {
    std::filesystem::remove(kHosts);
    std::filesystem::remove(kHostname);
    EXPECT_OUTCOME(set("nas"), success("nas"));
    expect_names("nas", "nas", "nas");
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_files_areReadableByAll) {
    const mode_t mask = umask(077);
    ASSERT_EQ(0, chmod(kHosts.c_str(), 0));
    ASSERT_EQ(0, chmod(kHostname.c_str(), 0));
    EXPECT_OUTCOME(set("nas"), success("nas"));
    umask(mask);
    EXPECT_EQ(0644U, mode_of(kHosts));
    EXPECT_EQ(0644U, mode_of(kHostname));
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_linkInAFilesPlace_isReplaced) {
    write_file("/tmp/elsewhere", "mine\n");
    for (const std::string &path : {kHosts, kHostname}) {
        std::filesystem::remove(path);
        std::filesystem::create_symlink("/tmp/elsewhere", path);
    }
    EXPECT_OUTCOME(set("nas"), success("nas"));
    expect_names("nas", "nas", "nas");
    EXPECT_EQ("mine\n", read_file("/tmp/elsewhere"));
    EXPECT_TRUE(std::filesystem::is_regular_file(std::filesystem::symlink_status(kHostname)));
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_readerOfTheOldFile_keepsIt) {
    FILE *const reader = fopen(kHosts.c_str(), "re");
    ASSERT_NE(nullptr, reader);
    EXPECT_OUTCOME(set("nas"), success("nas"));
    std::string text(hosts_of("old").size(), '\0');
    EXPECT_EQ(text.size(), fread(text.data(), 1, text.size(), reader));
    fclose(reader);
    EXPECT_EQ(hosts_of("old"), text);
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_container_changesNothing) {
    write_file("/etc/kova/platform.conf", "docker_hmx=\"yes\"\n");
    EXPECT_OUTCOME(set("nas"), {.result = 0, .locks = kLocked});
    expect_names("old", "old", "old");
    EXPECT_OUTCOME(set(long_text(64)), {.result = -1, .code = 0xE00, .unit = "lnx_set_hostname"});
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_lockHeldElsewhere_changesNothing) {
    for (const uint32_t word : {0x105U, 0x106U}) {
        const lock_elsewhere other{word};
        outcome got = set("nas");
        EXPECT_FALSE(got.sleeps.empty());
        got.sleeps.clear();
        EXPECT_OUTCOME(got, {.result = -1,
                             .code = 0x400,
                             .unit = "lnx_set_hostname",
                             .log = {"ERR lnx_set_hostname:N KLIBCFileLock() failed.(400)"}});
        expect_names("old", "old", "old");
    }
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_kernelRefuses_changesNothing) {
    rig.fail("sethostname");
    EXPECT_OUTCOME(set("nas"), failure(0x8100));
    expect_names("old", "old", "old");
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_hostnameCannotBeMade_isTold) {
    rig.fail("fopen");
    EXPECT_OUTCOME(set("nas"), failure(0x900, {"ERR lnx_set_hostname:N fopen failed: Too many open files"}));
    expect_names("nas", "old", "old");
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_hostnameIsADirectory_isTold) {
    std::filesystem::remove(kHostname);
    std::filesystem::create_directories(kHostname + "/inner");
    EXPECT_OUTCOME(set("nas"), failure(0x900, {"ERR lnx_set_hostname:N fopen failed: Is a directory"}));
    EXPECT_EQ(hosts_of("old"), read_file(kHosts));
    EXPECT_TRUE(std::filesystem::is_directory(kHostname + "/inner"));
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_hostnameCannotBeWritten_isKept) {
    for (const char *call : {"fsync", "fclose"}) {
        rig.fail(call);
        EXPECT_OUTCOME(set("nas"), failure(0xB00));
        expect_names("nas", "old", "old");
    }
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_hostnameCannotBeReplaced_isKept) {
    rig.fail("rename");
    EXPECT_OUTCOME(set("nas"), failure(0x2800));
    expect_names("nas", "old", "old");
    rig.fail("KLIBCFileITmpName");
    EXPECT_OUTCOME(set("nas"), failure(0xD00));
    expect_names("nas", "old", "old");
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_directoryCannotBeSynced_isDoneAllTheSame) {
    for (const int nth : {2, 4}) {
        rig.fail("fsync", nth);
        EXPECT_EQ(0, set("nas").result);
        expect_names("nas", "nas", "nas");
    }
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_hostsCannotBeMade_isKept) {
    rig.fail("fopen", 2);
    EXPECT_OUTCOME(set("nas"), failure(0x900));
    expect_names("nas", "nas", "old");
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_hostsCannotBeWritten_isKept) {
    rig.fail("fsync", 3);
    EXPECT_OUTCOME(set("nas"), failure(0xB00));
    rig.fail("fclose", 2);
    EXPECT_OUTCOME(set("nas"), failure(0xB00));
    expect_names("nas", "nas", "old");
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_hostsCannotBeReplaced_isKept) {
    rig.fail("rename", 2);
    EXPECT_OUTCOME(set("nas"), failure(0x2800));
    rig.fail("KLIBCFileITmpName", 2);
    EXPECT_OUTCOME(set("nas"), failure(0xD00));
    expect_names("nas", "nas", "old");
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_hostsIsADirectory_isKept) {
    std::filesystem::remove(kHosts);
    std::filesystem::create_directories(kHosts + "/inner");
    EXPECT_OUTCOME(set("nas"), failure(0x2800));
    EXPECT_EQ("nas\n", read_file(kHostname));
    EXPECT_TRUE(std::filesystem::is_directory(kHosts + "/inner"));
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_fullFileSystem_keepsTheOldFiles) {
    const mounted full{"/etc", "nr_blocks=3"};
    write_file(kHostname, "old\n");
    write_file(kHosts, hosts_of("old"));
    const texts names = list_dir("/etc");
    write_file("/etc/filler", "x");
    EXPECT_OUTCOME(set("nas"), failure(0xB00));
    expect_names("nas", "old", "old");
    std::filesystem::remove("/etc/filler");
    EXPECT_EQ(names, list_dir("/etc"));
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_fileSystemThatFillsUp_keepsTheOldHosts) {
    const mounted full{"/etc", "nr_blocks=1"};
    std::filesystem::create_symlink("/tmp/hosts", kHosts);
    write_file("/tmp/hosts", hosts_of("old"));
    EXPECT_OUTCOME(set("nas"), failure(0xB00));
    expect_names("nas", "nas", "old");
    EXPECT_EQ((texts{"hostname", "hosts"}), list_dir("/etc"));
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_noRoomForAFile_keepsTheOldFiles) {
    const mounted full{"/etc", "nr_inodes=3"}; // with its root
    write_file(kHostname, "old\n");
    write_file(kHosts, hosts_of("old"));
    EXPECT_OUTCOME(set("nas"), failure(0x900, {"ERR lnx_set_hostname:N fopen failed: No space left on device"}));
    expect_names("nas", "old", "old");
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_readOnlyFileSystem_keepsTheOldFiles) {
    const mounted read_only{"/etc", nullptr};
    write_file(kHosts, hosts_of("old"));
    write_file(kHostname, "old\n");
    read_only.make_read_only();
    EXPECT_OUTCOME(set("nas"), failure(0x900, {"ERR lnx_set_hostname:N fopen failed: Read-only file system"}));
    expect_names("nas", "old", "old");
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_readOnlyFileSystemWithoutFiles_isTold) {
    const mounted read_only{"/etc", nullptr, MS_RDONLY};
    EXPECT_OUTCOME(set("nas"), failure(0x900, {"ERR lnx_set_hostname:N fopen failed: Read-only file system"}));
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_loggerThatFails_endsTheCall) {
    for (const int status : {1, 127, 137, -1}) {
        rig.answer("/sbin/initctl", status);
        EXPECT_OUTCOME(set("nas"), failure(0, {}, kReload));
        expect_names("nas", "nas", "nas");
    }
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_filesAreThere_beforeTheLoggerIsReloaded) {
    rig.answer("/sbin/initctl", 0, "", [] { expect_names("nas", "nas", "nas"); });
    EXPECT_OUTCOME(set("nas"), success("nas"));
}

TEST_F(lnx_set_hostname, KOVALnxSetHostname_eventThatFails_failsAndKeepsTheName) {
    rig.fail("KLIBPluginAction");
    EXPECT_OUTCOME(set("nas"), {.result = -1,
                                .code = 0x2A00,
                                .unit = "platform",
                                .log = {"ERR KLIBPluginAction failed"},
                                .commands = kReload,
                                .events = {"net/hostname_change 5 HOSTNAME=nas"},
                                .locks = kLocked});
    expect_names("nas", "nas", "nas");
}

} // namespace
