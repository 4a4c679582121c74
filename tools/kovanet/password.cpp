#include "password.h"

#include "errors.h"
#include "table.h"
#include "words.h"

#include <algorithm>
#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <iterator>
#include <poll.h>
#include <termios.h>
#include <unistd.h>

namespace kova {
namespace {

constexpr char kFile[] = "--password-file";
constexpr char kFd[] = "--password-fd";
constexpr char kKeep[] = "--keep-password";

/** The signal that came while a password was typed. */
volatile sig_atomic_t caught;

/** Keeps a terminal from showing what is typed; gives it back as it was, also when a signal ends the program. */
class silent_terminal {
public:
    explicit silent_terminal(int fd) : fd_(fd) {
        caught = 0;
        sigset_t all;
        sigemptyset(&all);
        struct sigaction note {};
        note.sa_handler = [](int number) { caught = number; };
        for (const int number : kSignals) {
            sigaddset(&all, number);
        }
        sigprocmask(SIG_BLOCK, &all, &mask_);
        for (size_t i = 0; i < std::size(kSignals); ++i) {
            sigaction(kSignals[i], &note, &before_[i]);
        }
        tcgetattr(fd_, &shown_);
        termios silent = shown_;
        silent.c_lflag &= ~static_cast<tcflag_t>(ECHO);
        tcsetattr(fd_, TCSAFLUSH, &silent);
    }
    silent_terminal(const silent_terminal &) = delete;
    silent_terminal &operator=(const silent_terminal &) = delete;
    ~silent_terminal() {
        tcsetattr(fd_, TCSAFLUSH, &shown_);
        for (size_t i = 0; i < std::size(kSignals); ++i) {
            sigaction(kSignals[i], &before_[i], nullptr);
        }
        sigprocmask(SIG_SETMASK, &mask_, nullptr);
        if (caught != 0) {
            raise(caught);
        }
    }

    /** Waits until something can be read. Signals come only here: one just before a read would not end it. */
    [[nodiscard]] bool is_typed_on() const {
        pollfd typed{fd_, POLLIN, 0};
        return ppoll(&typed, 1, nullptr, &mask_) > 0;
    }

private:
    static constexpr int kSignals[] = {SIGINT, SIGTERM, SIGQUIT, SIGHUP, SIGTSTP};
    int fd_;
    termios shown_{};
    struct sigaction before_[std::size(kSignals)]{};
    sigset_t mask_{};
};

/** What was read, wiped when it goes. */
class secret_bytes {
public:
    secret_bytes() = default;
    secret_bytes(const secret_bytes &) = delete;
    secret_bytes &operator=(const secret_bytes &) = delete;
    ~secret_bytes() { explicit_bzero(bytes_, sizeof bytes_); }

    /** Up to the end, on a terminal of a line. @return false: errno says why not, EFBIG when there is no more room */
    bool read_from(int fd, const silent_terminal *terminal = nullptr);
    /** The password, whose line end has gone; ends the program when it is none. */
    void copy_to(char *field, size_t size);

private:
    [[nodiscard]] bool ends_line() const { return length_ > 0 && bytes_[length_ - 1] == '\n'; }

    char bytes_[1024];
    size_t length_ = 0;
};

bool secret_bytes::read_from(int fd, const silent_terminal *terminal) {
    length_ = 0;
    while (length_ < sizeof bytes_) {
        if (terminal != nullptr && !terminal->is_typed_on()) {
            return false;
        }
        const ssize_t got = read(fd, bytes_ + length_, sizeof bytes_ - length_);
        if (got < 0) {
            return false;
        }
        length_ += static_cast<size_t>(got);
        if (got == 0 || (terminal != nullptr && ends_line())) {
            return true;
        }
    }
    errno = EFBIG;
    return false;
}

void secret_bytes::copy_to(char *field, size_t size) {
    if (ends_line()) {
        --length_;
        length_ -= length_ > 0 && bytes_[length_ - 1] == '\r' ? 1 : 0;
    }
    const auto is_control = [](unsigned char byte) { return byte < ' ' || byte == 0x7f; };
    if (std::any_of(bytes_, bytes_ + length_, is_control)) {
        throw failure{kNo, "the password is not valid: it is one line without control characters"};
    }
    if (length_ >= size) {
        throw failure{kNo, "the password is too long: it has at most " + std::to_string(size - 1) + " bytes"};
    }
    memset(field, 0, size);
    memcpy(field, bytes_, length_);
}

[[noreturn]] void read_failed(const std::string &from) {
    throw failure{kNo, "cannot read the password from " + from + ": " + strerror(errno)};
}

void ask(secret_bytes &secret) {
    if (isatty(STDIN_FILENO) != 1 || isatty(STDERR_FILENO) != 1) {
        throw failure{kUsage, std::string("there is no terminal to ask for the password on; give it with ") + kFile +
                                  " FILE or " + kFd + " NUMBER"};
    }
    bool is_read = false;
    do { // anew when it was stopped and goes on
        {
            const silent_terminal terminal{STDIN_FILENO}; // before it asks: what was typed till then is dropped
            fputs("Password: ", stderr);
            is_read = secret.read_from(STDIN_FILENO, &terminal);
        }
        fputc('\n', stderr);
    } while (!is_read && caught == SIGTSTP);
    if (!is_read) {
        read_failed("the terminal");
    }
}

void read_file(const std::string &path, secret_bytes &secret) {
    const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY);
    const bool is_read = fd >= 0 && secret.read_from(fd);
    const int reason = errno;
    if (fd >= 0) {
        close(fd);
    }
    errno = reason;
    if (!is_read) {
        read_failed(path);
    }
}

} // namespace

void add_password(CLI::App &command, password_words &words) {
    auto *file = command.add_option(kFile, words.file, "file whose only line is the password")->type_name("FILE");
    auto *fd = command.add_option(kFd, words.fd, "open descriptor to read that line from; 0 is standard input")
                   ->type_name("NUMBER")
                   ->excludes(file);
    command.add_flag(kKeep, words.is_kept, "leave the stored password as it is")->excludes(file)->excludes(fd);
    command
        .add_option_function<std::string>("--password",
                                          [](const std::string &) {
                                              throw failure{kUsage, std::string("passwords are not given on the "
                                                                                "command line, where everybody can "
                                                                                "read them; see ") +
                                                                        kFile + " and " + kFd};
                                          })
        ->group("");
}

void read_password(const password_words &words, char *field, size_t size) {
    if (words.is_kept) {
        if (*field == '\0') {
            throw failure{kNo, "no password is kept; give one"};
        }
        return;
    }
    secret_bytes secret;
    if (words.file) {
        read_file(*words.file, secret);
    } else if (!words.fd) {
        ask(secret);
    } else if (!secret.read_from(static_cast<int>(number_within(kFd, *words.fd, 0, INT_MAX)))) {
        read_failed("descriptor " + *words.fd);
    }
    secret.copy_to(field, size);
    if (*field == '\0') {
        throw failure{kNo, "there is no password: it is empty"};
    }
}

} // namespace kova
