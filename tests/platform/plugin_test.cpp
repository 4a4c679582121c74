#include "platform_test.h"

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <sstream>

#include <unistd.h>

#include "kova/plugin.h"

using namespace kova_test;

namespace {

constexpr const char *kEvent = "net/kova_test";
constexpr const char *kDirectory = "/usr/kova/plugins/net/kova_test";

class plugin : public platform_test {
protected:
    plugin() { EXPECT_EQ(KLIBPluginSDKInit("net", kEvent, &handle_), 0); }
    ~plugin() override {
        EXPECT_EQ(KLIBPluginExit(handle_), 0);
        std::filesystem::remove_all(kDirectory);
    }

    void install(const std::string &name, const std::string &text, unsigned mode = 0755) const {
        write_file(std::string{kDirectory} + "/" + name, "#!/bin/sh\n" + text + "\n", mode);
    }
    [[nodiscard]] std::string output() const { return read_file(path("out")); }
    [[nodiscard]] std::string to_output() const { return " >> " + path("out"); }
    /** @return the lines of the output, sorted */
    [[nodiscard]] std::vector<std::string> sorted_output() const {
        std::vector<std::string> lines;
        std::istringstream text{output()};
        for (std::string line; std::getline(text, line);)
            lines.push_back(line);
        std::sort(lines.begin(), lines.end());
        return lines;
    }

    uint64_t handle_ = 0;
};

} // namespace

TEST_F(plugin, KLIBPluginSDKInit_event_givesAHandle) {
    uint64_t other = 0;
    EXPECT_NE(handle_, 0U);
    EXPECT_WORKS(KLIBPluginSDKInit("service", "service", &other), 0);
    EXPECT_NE(other, handle_);
    EXPECT_WORKS(KLIBPluginHasInit(other), 1);
    EXPECT_WORKS(KLIBPluginExit(other), 0);
    EXPECT_WORKS(KLIBPluginHasInit(other), 0);
    EXPECT_WORKS(KLIBPluginHasInit(handle_), 1);
    EXPECT_WORKS(KLIBPluginHasInit(0), 0);
}

TEST_F(plugin, KLIBPluginSDKInit_badArguments_areRefused) {
    uint64_t handle = 7;
    for (const char *event :
         {"", "/net", "net/", "net//x", ".", "..", "../x", "net/../../x", "net/.x", "a b", "a\n", "a;b"}) {
        EXPECT_FAILS(KLIBPluginSDKInit("net", event, &handle), -1, 0xD00);
        EXPECT_EQ(handle, 0U);
    }
    EXPECT_FAILS(KLIBPluginSDKInit("net", std::string(300, 'x').c_str(), &handle), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSDKInit("net", nullptr, &handle), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSDKInit(nullptr, kEvent, &handle), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSDKInit("other", kEvent, &handle), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSDKInit("net", kEvent, nullptr), -1, 0xD00);
}

TEST_F(plugin, KLIBPluginAction_noPlugins_isSuccess) {
    EXPECT_WORKS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), 0);
    std::filesystem::create_directories(kDirectory);
    EXPECT_WORKS(KLIBPluginAction(KLIB_PLUGIN_POST, handle_), 0);
}

TEST_F(plugin, KLIBPluginAction_arguments_areInEnvironmentAndInput) {
    const char *const names[] = {"eth0", "eth 1"};
    install("show", "env | grep -vE '^(PWD|SHLVL|_|OLDPWD)='" + to_output() + "; cat" + to_output());
    setenv("KOVA_PLUGIN_LEAK", "1", 1);
    EXPECT_WORKS(KLIBPluginSetArg(handle_, "DEVICE", "eth0 \"$x\""), 0);
    EXPECT_WORKS(KLIBPluginSetArg(handle_, "EMPTY", ""), 0);
    EXPECT_WORKS(KLIBPluginSetArgByInt(handle_, "RESULT", -5), 0);
    EXPECT_WORKS(KLIBPluginSetArgByArray(handle_, "IFNAME", names, 2), 0);
    EXPECT_WORKS(KLIBPluginSetArgByArray(handle_, "NONE", nullptr, 0), 0);
    EXPECT_WORKS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), 0);
    unsetenv("KOVA_PLUGIN_LEAK");

    std::vector<std::string> expected;
    for (const char *line : {"PLUGIN_EVENT=net/kova_test", "PLUGIN_PHASE=PRE", "DEVICE=eth0 \"$x\"", "EMPTY=",
                             "RESULT=-5", "IFNAME_COUNT=2", "IFNAME_1=eth0", "IFNAME_2=eth 1", "NONE_COUNT=0"})
        expected.insert(expected.end(), 2, line);
    expected.emplace_back("PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin");
    std::sort(expected.begin(), expected.end());
    EXPECT_EQ(sorted_output(), expected);
}

TEST_F(plugin, KLIBPluginAction_input_keepsTheOrderAndIsWholeForEveryPlugin) {
    install("1", "cat" + to_output());
    install("2", "cat" + to_output());
    EXPECT_WORKS(KLIBPluginSetArg(handle_, "Z", "1"), 0);
    EXPECT_WORKS(KLIBPluginSetArg(handle_, "A", "2"), 0);
    EXPECT_WORKS(KLIBPluginSetArg(handle_, "Z", "3"), 0);
    EXPECT_WORKS(KLIBPluginAction(KLIB_PLUGIN_POST, handle_), 0);
    const std::string once = "PLUGIN_EVENT=net/kova_test\nPLUGIN_PHASE=POST\nZ=3\nA=2\n";
    EXPECT_EQ(output(), once + once);
}

TEST_F(plugin, KLIBPluginSetArg_again_replacesWholeArrays) {
    const char *const three[] = {"a", "b", "c"};
    install("show", "grep ^X" + to_output());
    EXPECT_WORKS(KLIBPluginSetArgByArray(handle_, "X", three, 3), 0);
    EXPECT_WORKS(KLIBPluginSetArgByArray(handle_, "X", three, 1), 0);
    EXPECT_WORKS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), 0);
    EXPECT_WORKS(KLIBPluginSetArg(handle_, "X", "text"), 0);
    EXPECT_WORKS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), 0);
    EXPECT_EQ(output(), "X_COUNT=1\nX_1=a\nX=text\n");
}

TEST_F(plugin, KLIBPluginSetArg_badArguments_areRefused) {
    const char *const values[] = {"a", "b\nc", nullptr};
    install("show", "cat" + to_output());
    for (const char *key : {"", "1A", "A B", "A=B", "A-B", "A\n", "PATH", "PLUGIN_EVENT", "PLUGIN_PHASE"})
        EXPECT_FAILS(KLIBPluginSetArg(handle_, key, "x"), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSetArg(handle_, nullptr, "x"), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSetArg(handle_, "A", nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSetArg(handle_, "A", "x\nPLUGIN_PHASE=POST"), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSetArgByArray(handle_, "A", values, 2), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSetArgByArray(handle_, "A", values + 2, 1), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSetArgByArray(handle_, "A", nullptr, 1), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSetArgByArray(handle_, "A", values, -1), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSetArg(0, "A", "x"), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginSetArgByInt(handle_ + 1000, "A", 1), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginAction(3, handle_), -1, 0xD00);
    EXPECT_FAILS(KLIBPluginAction(KLIB_PLUGIN_PRE, 0), -1, 0xD00);
    EXPECT_WORKS(KLIBPluginExit(0), 0);
    EXPECT_WORKS(KLIBPluginExit(handle_ + 1000), 0);
    EXPECT_WORKS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), 0);
    EXPECT_EQ(output(), "PLUGIN_EVENT=net/kova_test\nPLUGIN_PHASE=PRE\n");
}

TEST_F(plugin, KLIBPluginAction_severalPlugins_runInNameOrder) {
    for (const char *name : {"20-b", "10-a", "3-c"})
        install(name, "echo $(basename $0)" + to_output());
    install(".hidden", "echo hidden" + to_output());
    install("not-executable", "echo never" + to_output(), 0644);
    std::filesystem::create_directories(std::string{kDirectory} + "/directory");
    ASSERT_EQ(symlink("10-a", (std::string{kDirectory} + "/99-link").c_str()), 0);
    EXPECT_WORKS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), 0);
    EXPECT_EQ(output(), "10-a\n20-b\n3-c\n99-link\n");
}

TEST_F(plugin, KLIBPluginAction_failingPlugin_failsAndDoesNotStopTheOthers) {
    install("1", "exit 1");
    install("2", "kill -KILL $$");
    install("3", "echo ran" + to_output());
    EXPECT_FAILS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), -1, 0x2A00);
    EXPECT_EQ(output(), "ran\n");
}

TEST_F(plugin, KLIBPluginAction_brokenPlugin_fails) {
    write_file(std::string{kDirectory} + "/broken", "#!/missing/interpreter\n", 0755);
    EXPECT_FAILS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), -1, 0x2A00);
}

TEST_F(plugin, KLIBPluginAction_hangingPlugin_isEndedWithItsChildren) {
    install("1", "trap '' TERM\nsleep 1000 &\necho $! > " + path("child") + "\nwhile :; do sleep 1000; done");
    install("2", "echo ran" + to_output());
    const double time = seconds_of([&] { EXPECT_FAILS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), -1, 0x2A00); });
    EXPECT_GT(time, 1.9);
    EXPECT_LT(time, 2 + kDelay);
    EXPECT_EQ(output(), "ran\n");
    const std::string child = std::to_string(std::atoi(read_file(path("child")).c_str()));
    EXPECT_NE(child, "0");
    EXPECT_TRUE(eventually([&] { return KLIBCIsProcAlive(child.c_str()) == 0; }));
}

TEST_F(plugin, KLIBPluginAction_manyHangingPlugins_areBoundedInAll) {
    for (const char *name : {"1", "2", "3", "4", "5"})
        install(name, "echo $0" + to_output() + "\nexec sleep 1000");
    const double time = seconds_of([&] { EXPECT_FAILS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), -1, 0x2A00); });
    EXPECT_GT(time, 3.5);
    EXPECT_LT(time, 4 + kDelay); // five times two seconds at least, were each given its own
    EXPECT_EQ(std::ranges::count(output(), '\n'), 2);
}

TEST_F(plugin, KLIBPluginAction_muchInput_waitsForNobody) {
    const std::string value(100000, 'x');
    install("ignores", "exit 0");
    install("reads", "wc -c" + to_output());
    EXPECT_WORKS(KLIBPluginSetArg(handle_, "X", value.c_str()), 0);
    EXPECT_WORKS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), 0);
    EXPECT_EQ(output(), std::to_string(100000 + 3 + 44) + "\n");
}

TEST_F(plugin, KLIBPluginAction_output_goesNowhere) {
    install(
        "loud",
        "streams=$(readlink /proc/$$/fd/1 /proc/$$/fd/2)\necho text; echo text >&2\necho $streams $(ls /proc/self/fd)" +
            to_output());
    EXPECT_WORKS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), 0);
    // 3 is the directory that ls reads
    EXPECT_EQ(output(), "/dev/null /dev/null 0 1 2 3\n");
}

TEST_F(plugin, KLIBPluginAction_descriptors_areGivenBack) {
    install("1", "exit 0");
    const auto before = open_descriptors();
    EXPECT_WORKS(KLIBPluginAction(KLIB_PLUGIN_PRE, handle_), 0);
    EXPECT_EQ(open_descriptors(), before);
}
