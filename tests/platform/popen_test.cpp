#include "platform_test.h"

#include <csignal>

#include <unistd.h>

using namespace kova_test;

namespace {

std::string rest_of(FILE *stream) {
    std::string text;
    for (int c = fgetc(stream); c != EOF; c = fgetc(stream))
        text += static_cast<char>(c);
    return text;
}

class popen : public platform_test {};

} // namespace

TEST_F(popen, KLIBCPopen_output_isRead) {
    mark_register();
    FILE *stream =
        KLIBCPopen("/bin/sh", "r", "-c", "printf '%s|' \"$@\"; echo error >&2", "sh", "a b", "", "*", nullptr);
    ASSERT_NE(stream, nullptr);
    EXPECT_EQ(rest_of(stream), "a b||*|");
    EXPECT_EQ(KLIBCPclose(stream), 0);
    EXPECT_EQ(KLIBCErrGet(), kMark);
}

TEST_F(popen, KLIBCPopen_muchOutput_isReadWhole) {
    FILE *stream = KLIBCPopen("/usr/bin/seq", "r", "100000", nullptr);
    ASSERT_NE(stream, nullptr);
    const std::string text = rest_of(stream);
    EXPECT_EQ(text.size(), 588895U);
    EXPECT_TRUE(text.ends_with("\n100000\n"));
    EXPECT_EQ(KLIBCPclose(stream), 0);
}

TEST_F(popen, KLIBCPclose_status_isTheProgramsOwn) {
    EXPECT_EQ(KLIBCPclose(KLIBCPopen("/bin/sh", "r", "-c", "exit 5", nullptr)), 5);
    EXPECT_EQ(KLIBCPclose(KLIBCPopen("/bin/sh", "r", "-c", "kill -KILL $$", nullptr)), 128 + SIGKILL);
}

TEST_F(popen, KLIBCPclose_beforeTheEnd_endsTheProgram) {
    FILE *stream = KLIBCPopen("/usr/bin/yes", "r", nullptr);
    ASSERT_NE(stream, nullptr);
    char line[8];
    EXPECT_STREQ(fgets(line, sizeof line, stream), "y\n");
    EXPECT_EQ(KLIBCPclose(stream), 128 + SIGPIPE);
}

TEST_F(popen, KLIBCPopen_twoStreams_areIndependent) {
    FILE *first = KLIBCPopen("/bin/cat", "r", "/proc/self/comm", nullptr);
    FILE *second = KLIBCPopen("/bin/sh", "r", "-c", "ls /proc/self/fd; exit 2", nullptr);
    EXPECT_EQ(rest_of(second), "0\n1\n2\n3\n");
    EXPECT_EQ(rest_of(first), "cat\n");
    EXPECT_EQ(KLIBCPclose(first), 0);
    EXPECT_EQ(KLIBCPclose(second), 2);
}

TEST_F(popen, KLIBCPopen_cannotBeExecuted_isNull) {
    const auto before = open_descriptors();
    EXPECT_FAILS(KLIBCPopen("/missing", "r", nullptr), nullptr, 0x2A00);
    write_file(path("plain"), "#!/bin/sh\n", 0644);
    EXPECT_FAILS(KLIBCPopen(path("plain").c_str(), "r", nullptr), nullptr, 0x2A00);
    EXPECT_EQ(open_descriptors(), before);
}

TEST_F(popen, KLIBCPopen_badArguments_areRefused) {
    EXPECT_FAILS(KLIBCPopen(nullptr, "r", nullptr), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCPopen("cat", "r", nullptr), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCPopen("/bin/cat", nullptr, nullptr), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCPopen("/bin/cat", "w", nullptr), nullptr, 0xD00);
}

TEST_F(popen, KLIBCPclose_foreignStream_isRefusedAndStaysOpen) {
    FILE *stream = fopen("/dev/null", "r");
    EXPECT_FAILS(KLIBCPclose(stream), -1, 0xD00);
    EXPECT_EQ(fclose(stream), 0);
    EXPECT_FAILS(KLIBCPclose(nullptr), -1, 0xD00);
}

TEST_F(popen, KLIBCPclose_descriptors_areGivenBack) {
    const auto before = open_descriptors();
    for (int i = 0; i < 20; i++)
        EXPECT_EQ(KLIBCPclose(KLIBCPopen("/bin/true", "r", nullptr)), 0);
    EXPECT_EQ(open_descriptors(), before);
}
