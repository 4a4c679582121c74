#include "platform_test.h"

#include <filesystem>

#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/utsname.h>
#include <unistd.h>

using namespace kova_test;

namespace {

/** What the platform says of a module when these texts stand in the kernel's files, in a mount name space of its own.
 */
int asked_with(const std::string &path, const std::string &text, const char *module) {
    return in_child([&] {
        const std::string directory = std::filesystem::path{path}.parent_path();
        if (unshare(CLONE_NEWNS) != 0 || mount("fake", directory.c_str(), "tmpfs", 0, nullptr) != 0)
            return 100;
        write_file(path, text);
        mark_register();
        const int result = KLIBCModuleIsLoad(module);
        return KLIBCErrGet() != kMark ? 101 : result;
    });
}

std::string builtin_list() {
    struct utsname system;
    uname(&system);
    return std::string{"/lib/modules/"} + system.release + "/modules.builtin";
}

} // namespace

TEST(module, KLIBCModuleIsLoad_unknownModule_isNotLoaded) {
    EXPECT_WORKS(KLIBCModuleIsLoad("kova_no_such_module"), 0);
}

TEST(module, KLIBCModuleIsLoad_kernelEntry_isLoaded) {
    ASSERT_FALSE(names_in("/sys/module").empty());
    EXPECT_WORKS(KLIBCModuleIsLoad(names_in("/sys/module").front().c_str()), 1);
}

TEST(module, KLIBCModuleIsLoad_builtIn_isLoaded) {
    const std::string list = builtin_list();
    const kept_file keep{list};
    write_file(list, "kernel/net/kova/kova-built-in.ko\nkernel/drivers/other.ko\n");
    EXPECT_WORKS(KLIBCModuleIsLoad("kova-built-in"), 1);
    EXPECT_WORKS(KLIBCModuleIsLoad("kova_built_in"), 1);
    EXPECT_WORKS(KLIBCModuleIsLoad("kova_built"), 0);
    EXPECT_WORKS(KLIBCModuleIsLoad("kova"), 0);
}

TEST(module, KLIBCModuleIsLoad_listedModule_isLoaded) {
    const std::string text = "kova_other 16384 0 - Live 0x0\nkova_listed 36864 1 kova_other, Live 0x0\n";
    EXPECT_EQ(asked_with("/proc/modules", text, "kova_listed"), 1);
    EXPECT_EQ(asked_with("/proc/modules", text, "kova-listed"), 1);
    EXPECT_EQ(asked_with("/proc/modules", text, "kova_list"), 0);
    EXPECT_EQ(asked_with("/proc/modules", text, "Live"), 0);
}

TEST(module, KLIBCModuleIsLoad_noProc_fails) {
    const int status = in_child([] {
        if (unshare(CLONE_NEWNS) != 0 || mount("fake", "/proc", "tmpfs", 0, nullptr) != 0)
            return 100;
        return KLIBCModuleIsLoad("kova_no_such_module") == -1 && KLIBCErrGet() == 0x900 ? 0 : 1;
    });
    EXPECT_EQ(status, 0);
}

TEST(module, KLIBCModuleIsLoad_badName_isRefused) {
    EXPECT_FAILS(KLIBCModuleIsLoad(nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBCModuleIsLoad(""), -1, 0xD00);
    EXPECT_FAILS(KLIBCModuleIsLoad("../module"), -1, 0xD00);
    EXPECT_FAILS(KLIBCModuleIsLoad("."), -1, 0xD00);
    EXPECT_FAILS(KLIBCModuleIsLoad(std::string(300, 'x').c_str()), -1, 0xD00);
}

TEST(module, KLIBCSupportDualhead_platformFile_says) {
    const kept_file keep{"/etc/kova/platform.conf"};
    unlink("/etc/kova/platform.conf");
    EXPECT_WORKS(KLIBCSupportDualhead(), 0);
    write_file("/etc/kova/platform.conf", "support_dualhead=\"yes\"\n");
    EXPECT_WORKS(KLIBCSupportDualhead(), 1);
    write_file("/etc/kova/platform.conf", "support_dualhead=\"yes and no\"\n");
    EXPECT_WORKS(KLIBCSupportDualhead(), 0);
}
