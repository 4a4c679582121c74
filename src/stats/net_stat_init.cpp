#include <kovanetsdk/stats.h>

#include "core/guards.h"
#include "core/report.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

using namespace kova;

namespace {

/** Most of a line that is looked at in one go, with the terminator. */
using stat_line = char[512];

bool is_digit(char c) {
    return c >= '0' && c <= '9';
}

/** The number that begins a rest of a name, of at most 15 digits. */
uint64_t read_number(const char *digits) {
    uint64_t number = 0;
    for (; is_digit(*digits); ++digits) {
        number = number * 10 + static_cast<uint64_t>(*digits - '0');
    }
    return number;
}

/** Natural order: eth2 before eth10. */
bool is_before(const NETSTAT &left, const NETSTAT &right) {
    const char *a = left.szIfname;
    const char *b = right.szIfname;
    while (*a == *b && *a != '\0' && !is_digit(*a)) {
        ++a;
        ++b;
    }
    if (is_digit(*a) && is_digit(*b)) {
        const uint64_t number_a = read_number(a);
        const uint64_t number_b = read_number(b);
        if (number_a != number_b) {
            return number_a < number_b;
        }
    }
    return strcmp(left.szIfname, right.szIfname) < 0;
}

bool begins_with(const char *text, const char *beginning) {
    return strncmp(text, beginning, strlen(beginning)) == 0;
}

/** Monitor, tap, container and guest-system devices are not shown. */
bool is_hidden(const char *szIfname) {
    return strstr(szIfname, "mon.") != nullptr || begins_with(szIfname, "tap") || begins_with(szIfname, "docker") ||
           begins_with(szIfname, "dhmx");
}

/** Reads the next number of a line; false, and 0, at what is none. One beyond 64 bits becomes the nearest that fits. */
bool read_counter(char **rest, int64_t &counter) {
    char *const begin = *rest;
    counter = strtoll(begin, rest, 10);
    return *rest != begin;
}

void skip_fields(char **rest, int fields) {
    constexpr char kBlanks[] = " \t\n\v\f\r";
    for (int i = 0; i < fields; ++i) {
        *rest += strspn(*rest, kBlanks);
        *rest += strcspn(*rest, kBlanks);
    }
}

/** Reads the 1st, 2nd, 9th and 10th counter of a line, as far as they are there. */
void read_counters(char *rest, NETSTAT &record) {
    if (!read_counter(&rest, record.nRxBytes) || !read_counter(&rest, record.nRxPackets)) {
        return;
    }
    skip_fields(&rest, 6);
    if (read_counter(&rest, record.nTxBytes)) {
        read_counter(&rest, record.nTxPackets);
    }
}

/** Fills records from the lines behind the header; says in is_whole whether no foreign line cut the list short. */
int read_records(FILE *file, NETSTAT *pStat, int nItem, bool &is_whole) {
    stat_line line;
    int filled = 0;
    while (filled < nItem && fgets(line, sizeof line, file) != nullptr) {
        char *const colon = strchr(line, ':');
        if (colon == nullptr) {
            is_whole = false;
            break;
        }
        *colon = '\0';
        const char *const szIfname = line + strspn(line, " \t");
        if (is_hidden(szIfname)) {
            continue;
        }
        NETSTAT &record = pStat[filled++];
        record = {};
        record.blValid = 1;
        memcpy(record.szIfname, szIfname, strnlen(szIfname, sizeof record.szIfname - 1));
        read_counters(colon + 1, record);
    }
    return filled;
}

void skip_header(FILE *file) {
    stat_line line;
    for (int i = 0; i < 2 && fgets(line, sizeof line, file) != nullptr; ++i) {
    }
}

} // namespace

extern "C" NETSTAT *KLIBNetStatInit(int nItem) {
    if (refuses(HERE, nItem != 0, "0 != nItem") || refuses(HERE, nItem > 0, "0 < nItem")) {
        return nullptr;
    }
    auto *const records = static_cast<NETSTAT *>(calloc(static_cast<size_t>(nItem), sizeof(NETSTAT)));
    if (records == nullptr) {
        fail_quietly(HERE, NET_ERR_OUT_OF_MEMORY, -1);
        return nullptr;
    }
    for (int i = 0; i < nItem; ++i) {
        records[i].blValid = 1;
    }
    return records;
}

extern "C" void KLIBNetStatFree(NETSTAT *pStat) {
    free(pStat);
}

extern "C" int KLIBNetStatGetAll(NETSTAT *pStat, int nItem) {
    if (refuses_null(HERE, "pStat", pStat) || refuses(HERE, nItem > 0, "0 < nItem")) {
        return -1;
    }
    char buffer[8192]; // the kernel hands out a page at each system call
    const stream file{fopen("/proc/net/dev", "re")};
    if (!file.is_held()) {
        return fail_quietly(HERE, NET_ERR_FILE_OPEN, -1);
    }
    setvbuf(file.get(), buffer, _IOFBF, sizeof buffer);

    skip_header(file.get());
    bool is_whole = true;
    const int filled = read_records(file.get(), pStat, nItem, is_whole);
    if (ferror(file.get()) != 0) {
        return fail_quietly(HERE, NET_ERR_PARSE, -1);
    }
    if (is_whole) {
        std::sort(pStat, pStat + filled, is_before);
    }
    return filled;
}

extern "C" int KLIBNetStatGetSingle(const char *szIfname, NETSTAT *pStat) {
    if (refuses_text(HERE, "szIfname", szIfname) || refuses_null(HERE, "pStat", pStat)) {
        return -1;
    }
    constexpr int kMost = 64;
    const heap<NETSTAT> records{KLIBNetStatInit(kMost)};
    if (records == nullptr) {
        return -1;
    }
    const int found = KLIBNetStatGetAll(records.get(), kMost);
    for (int i = 0; i < found; ++i) {
        const NETSTAT &record = records.get()[i];
        if (strcmp(record.szIfname, szIfname) == 0) {
            *pStat = record;
            return 0;
        }
    }
    return -1;
}
