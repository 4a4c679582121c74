// What the tests of the platform operations share. They run as root of a throw-away root file system.
#ifndef KOVA_PLATFORM_TEST_H
#define KOVA_PLATFORM_TEST_H

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include <gtest/gtest.h>
#include <sys/types.h>

#include "kova/core.h"

namespace kova_test {

void write_file(const std::string &path, std::string_view text, unsigned mode = 0644);
/** @return the whole file; a note that no file has when it cannot be read */
std::string read_file(const std::string &path);
/** @return every name in a directory, dot names included, sorted */
std::vector<std::string> names_in(const std::string &directory);
std::vector<std::string> texts_of(const KLIBSZLIST *list);
/** @return the descriptors this process has open, and what they are */
std::vector<std::string> open_descriptors();

/** Puts a mark in the error register, so that a test sees whether a call touched it. */
void mark_register();
constexpr uint32_t kMark = 0xABCD00;

/** Runs a function in a forked child. @return what it returns, or 128 + signal */
int in_child(const std::function<int()> &function);
/** Forks a child that runs a function; the caller waits for it or kills it. */
pid_t start_child(const std::function<int()> &function);
int wait_for(pid_t pid);

/** Waits up to some seconds until a condition holds. */
bool eventually(const std::function<bool()> &condition, int seconds = 60);
double seconds_of(const std::function<void()> &function);
/** Seconds by which a busy machine may be late. */
constexpr double kDelay = 20;

/** A directory of its own for every test, gone afterwards; the register marked. */
class platform_test : public testing::Test {
protected:
    platform_test();
    ~platform_test() override;
    [[nodiscard]] std::string path(const std::string &name) const { return directory_ + "/" + name; }
    [[nodiscard]] const std::string &directory() const { return directory_; }

private:
    std::string directory_;
};

/** A file of the system that a test writes; as it was afterwards. */
class kept_file {
public:
    explicit kept_file(std::string path);
    ~kept_file();
    kept_file(const kept_file &) = delete;
    kept_file &operator=(const kept_file &) = delete;

private:
    std::string path_;
    bool existed_;
    unsigned mode_ = 0644;
    std::string text_;
};

#define EXPECT_FAILS(call, result, code)                                                                               \
    do {                                                                                                               \
        ::kova_test::mark_register();                                                                                  \
        EXPECT_EQ((call), (result));                                                                                   \
        EXPECT_EQ(KLIBCErrGet(), static_cast<uint32_t>(code));                                                         \
    } while (false)

#define EXPECT_WORKS(call, result)                                                                                     \
    do {                                                                                                               \
        ::kova_test::mark_register();                                                                                  \
        EXPECT_EQ((call), (result));                                                                                   \
        EXPECT_EQ(KLIBCErrGet(), ::kova_test::kMark);                                                                  \
    } while (false)

} // namespace kova_test

#endif
