#include <kovanetsdk/pppoe.h>

#include "core/guards.h"
#include "core/kernel.h"
#include "core/kernel_files.h"
#include "core/report.h"
#include "core/text.h"

#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>

using namespace kova;

namespace {

constexpr char kCache[] = "/tmp/kovapppoe.intf";

/** @return 1 there is an interface of the connection; 0 none; -1, logged */
int find_ppp_interface() {
    const stream file{fopen("/proc/net/dev", "re")};
    if (!file.is_held()) {
        return fail(HERE, NET_ERR_FILE_OPEN, -1, "Failed to open %s: %m", "/proc/net/dev");
    }
    constexpr int kHeaderLines = 2;
    int number = 0;
    while (const heap<char> line = next_line(file)) {
        if (number++ < kHeaderLines) {
            continue;
        }
        char *const colon = strchr(line.get(), ':');
        if (colon == nullptr) {
            return fail_keeping_code(HERE, -1, "input string: %s don't contain charactor :", line.get());
        }
        *colon = '\0';
        const char *const szIfname = line.get() + strspn(line.get(), " \t");
        if (strstr(szIfname, "mon.") == nullptr && strncmp(szIfname, "ppp", 3) == 0) {
            return 1;
        }
    }
    return 0;
}

/** The directory is everybody's: only a plain file that is root's or the caller's own is believed. */
bool is_trusted(int fd) {
    struct stat status;
    return fstat(fd, &status) == 0 && S_ISREG(status.st_mode) && (status.st_uid == 0 || status.st_uid == geteuid());
}

/** @return the first line, "" for an empty file; nothing without a file to believe */
heap<char> read_cache() {
    descriptor fd{open(kCache, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC)};
    const stream file{fd.is_held() && is_trusted(fd.get()) ? fdopen(fd.get(), "r") : nullptr};
    if (!file.is_held()) {
        return nullptr;
    }
    (void)fd.give_up();
    heap<char> line = next_line(file);
    if (line == nullptr) {
        line.reset(strdup(""));
    }
    return line;
}

void write_cache(const char *szIfname) {
    unlink(kCache);
    constexpr mode_t kReadableByAll = 0644;
    const descriptor fd{open(kCache, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kReadableByAll)};
    const auto length = static_cast<ssize_t>(strlen(szIfname));
    if (fd.is_held() && write(fd.get(), szIfname, strlen(szIfname)) != length) {
        unlink(kCache);
    }
}

/** The first word of the status line about the connection's interface, "" without one; nothing, logged, on failure. */
heap<char> ask_status_tool() {
    const process_stream status{KLIBCPopen("/usr/sbin/pppoe-status", "r", nullptr)};
    if (!status.is_held()) {
        log_err(HERE, "failed to excute cmd/usr/sbin/pppoe-status");
        return nullptr;
    }
    while (const heap<char> line = next_line(status.get())) {
        if (strstr(line.get(), "Point-to-Point") != nullptr) {
            char *const word = line.get() + strspn(line.get(), " \t");
            word[strcspn(word, " \t\r\n")] = '\0';
            return heap<char>{strdup(word)};
        }
    }
    return heap<char>{strdup("")};
}

int report_address(uint32_t address, char *szOut, int cbOut) {
    address_text text;
    write_address(address, text);
    return copy_whole(szOut, cbOut, text) ? 0 : fail(HERE, NET_ERR_BAD_PARAMETER, -1, "No room for %s", text);
}

/** A buffer that can be filled. */
struct output {
    char *text;
    int size;
    [[nodiscard]] bool is_asked_for() const { return text != nullptr && size > 0; }
};

int read_net_info(const char *szIfname, const output &ip, const output &mask) {
    if (!ip.is_asked_for()) {
        return -1; // the socket has always been opened for the address
    }
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    uint32_t address = 0;
    if (socket.address(szIfname, address) < 0) {
        return fail(HERE, request_code(errno), -1, "Cannot get address of %s: %m", szIfname);
    }
    if (report_address(address, ip.text, ip.size) < 0) {
        return -1;
    }
    if (!mask.is_asked_for()) {
        return 0;
    }
    if (socket.netmask(szIfname, address) < 0) {
        return fail(HERE, request_code(errno), -1, "Cannot get netmask of %s: %m", szIfname);
    }
    return report_address(address, mask.text, mask.size);
}

} // namespace

extern "C" int KOVAPPPoeIntfGet(char *szIfname, int cbIfname) {
    if (refuses_null_text(HERE, "szIfname", szIfname) || refuses(HERE, cbIfname > 0, "0 < cbIfname") ||
        find_ppp_interface() < 1) {
        return -1;
    }
    heap<char> name = read_cache();
    const bool is_cached = name != nullptr;
    if (!is_cached) {
        name = ask_status_tool();
    }
    if (name == nullptr) {
        return -1;
    }
    if (*name.get() == '\0') {
        log_debug(HERE, "Failed to get real pppoe interface");
        return -1;
    }
    copy_cut(szIfname, static_cast<size_t>(cbIfname), name.get());
    if (!is_cached) {
        write_cache(name.get());
    }
    return 0;
}

extern "C" int KOVAPPPoeNetInfoGet(char *szIP, int cbIP, char *szMask, int cbMask) {
    const output ip{szIP, cbIP};
    const output mask{szMask, cbMask};
    if (!ip.is_asked_for() && !mask.is_asked_for()) {
        return 0;
    }
    char szIfname[IFNAMSIZ];
    if (KOVAPPPoeIntfGet(szIfname, sizeof szIfname) < 0 || read_net_info(szIfname, ip, mask) < 0) {
        unlink(kCache); // so that the next call asks anew
        return -1;
    }
    return 0;
}
