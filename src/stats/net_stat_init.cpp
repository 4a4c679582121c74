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

bool is_blank(char c) {
    return c == ' ' || ('\t' <= c && c <= '\r');
}

void skip_blanks(char **text) {
    while (is_blank(**text)) {
        ++*text;
    }
}

/** Reads the digits that begin a text; correct up to 19 of them. */
uint64_t read_number(char **text) {
    uint64_t number = 0;
    for (; is_digit(**text); ++*text) {
        number = number * 10 + static_cast<uint64_t>(**text - '0');
    }
    return number;
}

/** A record and what natural order looks at first: what is before the first digit of its name, and the number there. */
struct sortable {
    char beginning[sizeof NETSTAT::szIfname]; ///< with one '0' for the number
    uint64_t number;
    NETSTAT record;
};

sortable make_sortable(NETSTAT &record) {
    sortable made = {"", 0, record};
    char *c = record.szIfname;
    for (char *to = made.beginning; *c != '\0' && !is_digit(*c);) {
        *to++ = *c++;
    }
    if (is_digit(*c)) {
        made.beginning[c - record.szIfname] = '0';
        made.number = read_number(&c);
    }
    return made;
}

/** Natural order: eth2 before eth10. */
bool is_before(const sortable &left, const sortable &right) {
    const int order = memcmp(left.beginning, right.beginning, sizeof left.beginning);
    if (order != 0) {
        return order < 0;
    }
    return left.number != right.number ? left.number < right.number
                                       : strcmp(left.record.szIfname, right.record.szIfname) < 0;
}

/** @return whether there was memory for it */
bool sort_naturally(NETSTAT *pStat, int count) {
    const heap<sortable> sorted{static_cast<sortable *>(calloc(static_cast<size_t>(count) + 1, sizeof(sortable)))};
    if (sorted == nullptr) {
        return false;
    }
    sortable *const end = std::transform(pStat, pStat + count, sorted.get(), make_sortable);
    std::sort(sorted.get(), end, is_before);
    std::transform(sorted.get(), end, pStat, [](const sortable &one) { return one.record; });
    return true;
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
    constexpr int kAlwaysFit = 18;
    skip_blanks(rest);
    char *const begin = *rest;
    counter = static_cast<int64_t>(read_number(rest));
    if (*rest == begin || *rest - begin > kAlwaysFit) { // a sign, or too many digits
        counter = strtoll(begin, rest, 10);
    }
    return *rest != begin;
}

void skip_fields(char **rest, int fields) {
    for (int i = 0; i < fields; ++i) {
        skip_blanks(rest);
        while (**rest != '\0' && !is_blank(**rest)) {
            ++*rest;
        }
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
        const char *szIfname = line;
        while (*szIfname == ' ' || *szIfname == '\t') {
            ++szIfname;
        }
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
    if (is_whole && !sort_naturally(pStat, filled)) {
        return fail_quietly(HERE, NET_ERR_OUT_OF_MEMORY, -1);
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
