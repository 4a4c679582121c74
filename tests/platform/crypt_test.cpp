#include "platform_test.h"

#include <array>
#include <cstring>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

using namespace kova_test;

namespace {

constexpr const char *kKeyFile = "/etc/kova/secret.key";

class crypt : public testing::Test {
protected:
    crypt() { unlink(kKeyFile); }

    using buffer = std::array<char, 64>;
    static buffer cipher(const std::string &text) {
        buffer out;
        out.fill('?');
        EXPECT_EQ(KLIBCCryptBufCrypt(text.data(), static_cast<int>(text.size()), out.data(), out.size()), 0);
        return out;
    }

private:
    const kept_file keep_{kKeyFile};
};

} // namespace

TEST_F(crypt, KLIBCCryptBufCrypt_text_comesBack) {
    for (const std::string &text : {std::string{}, std::string{"p"}, std::string{"secret password"},
                                    std::string(31, '\xff'), std::string(64, 'x')}) {
        const buffer hidden = cipher(text);
        EXPECT_EQ(strnlen(hidden.data(), hidden.size()), text.size());
        for (size_t i = text.size(); i < hidden.size(); i++)
            EXPECT_EQ(hidden[i], '\0');
        buffer shown;
        EXPECT_WORKS(KLIBCCryptBufCrypt(hidden.data(), hidden.size(), shown.data(), shown.size()), 0);
        EXPECT_EQ(std::string(shown.data(), strnlen(shown.data(), shown.size())), text);
    }
}

TEST_F(crypt, KLIBCCryptBufCrypt_everyByteAtEveryPlace_comesBackWithoutZeros) {
    for (int byte = 1; byte < 256; byte++) {
        const std::string text(300, static_cast<char>(byte));
        std::array<char, 300> hidden;
        std::array<char, 300> shown;
        ASSERT_EQ(KLIBCCryptBufCrypt(text.data(), 300, hidden.data(), 300), 0);
        EXPECT_EQ(memchr(hidden.data(), 0, hidden.size()), nullptr);
        ASSERT_EQ(KLIBCCryptBufCrypt(hidden.data(), 300, shown.data(), 300), 0);
        EXPECT_EQ(std::string(shown.data(), shown.size()), text);
    }
}

TEST_F(crypt, KLIBCCryptBufCrypt_inPlace_works) {
    char text[16] = "in place";
    EXPECT_EQ(KLIBCCryptBufCrypt(text, 8, text, sizeof text), 0);
    EXPECT_STRNE(text, "in place");
    EXPECT_EQ(KLIBCCryptBufCrypt(text, 8, text, sizeof text), 0);
    EXPECT_STREQ(text, "in place");
}

TEST_F(crypt, KLIBCCryptBufCrypt_knownKey_givesTheChacha20Stream) {
    // the key stream of the all-zero key begins 76b8e0ad a0f13d90 405d6ae5 5386bd28 (RFC 8439, first test vector)
    write_file(kKeyFile, std::string(32, '\0'), 0600);
    const uint32_t stream[] = {0xade0b876, 0x903df1a0, 0xe56a5d40, 0x28bd8653};
    const buffer hidden = cipher("AAAA");
    for (size_t i = 0; i < 4; i++)
        EXPECT_EQ(static_cast<unsigned char>(hidden[i]), (stream[i] % 255 + 255 - ('A' - 1)) % 255 + 1);
}

TEST_F(crypt, KLIBCCryptBufCrypt_firstUse_makesAPrivateKey) {
    const mode_t mask = umask(0);
    cipher("x");
    umask(mask);
    struct stat status;
    ASSERT_EQ(stat(kKeyFile, &status), 0);
    EXPECT_EQ(status.st_mode, S_IFREG | 0600U);
    EXPECT_EQ(status.st_size, 32);
    EXPECT_EQ(status.st_nlink, 1U);
    for (const std::string &name : names_in("/etc/kova"))
        EXPECT_NE(name.front(), '.');
}

TEST_F(crypt, KLIBCCryptBufCrypt_anotherMachine_cannotRead) {
    const buffer here = cipher("password");
    const std::string key = read_file(kKeyFile);
    unlink(kKeyFile);
    const buffer there = cipher("password");
    EXPECT_NE(here, there);
    EXPECT_NE(read_file(kKeyFile), key);
    buffer shown;
    EXPECT_WORKS(KLIBCCryptBufCrypt(here.data(), here.size(), shown.data(), shown.size()), 0);
    EXPECT_STRNE(shown.data(), "password") << "its own key does not bring the text back";
    write_file(kKeyFile, key);
    EXPECT_EQ(cipher("password"), here);
}

TEST_F(crypt, KLIBCCryptBufCrypt_firstUseByMany_agreesOnOneKey) {
    std::vector<pid_t> children;
    int pipe_ends[2];
    ASSERT_EQ(pipe2(pipe_ends, O_CLOEXEC), 0);
    for (int i = 0; i < 16; i++)
        children.push_back(start_child([&] {
            const buffer hidden = cipher("password");
            return write(pipe_ends[1], hidden.data(), hidden.size()) == static_cast<ssize_t>(hidden.size()) ? 0 : 1;
        }));
    for (const pid_t pid : children)
        EXPECT_EQ(wait_for(pid), 0);
    const buffer expected = cipher("password");
    for (size_t i = 0; i < children.size(); i++) {
        buffer hidden;
        ASSERT_EQ(read(pipe_ends[0], hidden.data(), hidden.size()), static_cast<ssize_t>(hidden.size()));
        EXPECT_EQ(hidden, expected);
    }
    close(pipe_ends[0]);
    close(pipe_ends[1]);
}

TEST_F(crypt, KLIBCCryptBufCrypt_brokenKey_failsAndStays) {
    write_file(kKeyFile, "short");
    char out[8] = "before";
    EXPECT_FAILS(KLIBCCryptBufCrypt("x", 1, out, sizeof out), -1, 0x900);
    EXPECT_STREQ(out, "before");
    EXPECT_EQ(read_file(kKeyFile), "short");
}

TEST_F(crypt, KLIBCCryptBufCrypt_badArguments_areRefused) {
    char out[8];
    EXPECT_FAILS(KLIBCCryptBufCrypt(nullptr, 1, out, 8), -1, 0xD00);
    EXPECT_FAILS(KLIBCCryptBufCrypt("x", -1, out, 8), -1, 0xD00);
    EXPECT_FAILS(KLIBCCryptBufCrypt("x", 1, nullptr, 8), -1, 0xD00);
    EXPECT_FAILS(KLIBCCryptBufCrypt("x", 1, out, 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCCryptBufCrypt("0123456789", 10, out, 8), -1, 0xD00);
    EXPECT_NE(access(kKeyFile, F_OK), 0);
}
