#include "core/kernel_files.h"

#include "core/text.h"

#include <climits>
#include <cstring>

namespace kova {

heap<char> next_line(FILE *file) {
    char *line = nullptr;
    size_t room = 0;
    errno = 0; // the end of the file is no error
    const ssize_t length = getline(&line, &room, file);
    heap<char> owned{line};
    if (length < 0) {
        return nullptr;
    }
    if (length > 0 && line[length - 1] == '\n') {
        line[length - 1] = '\0';
    }
    return owned;
}

first_line::first_line(const char *path) {
    const stream file{fopen(path, "re")};
    if (file.is_held()) {
        is_open_ = true;
        text_ = next_line(file);
    }
}

bool leading_number(const char *text, int &number) {
    char *end = nullptr;
    errno = 0;
    const long value = strtol(text, &end, 10);
    if (end == text || errno != 0 || value < INT_MIN || value > INT_MAX) {
        return false;
    }
    number = static_cast<int>(value);
    return true;
}

namespace {

/** Whether a line "bond member member ..." names a member. @return 1, 0; -1 when memory runs out */
int names_member(char *line, const char *szIfname, KLIBSZLIST *words) {
    KLIBCSzListRemoveAll(words);
    if (split(KLIBCStrTrimSpace(line, line), " ", words) < 0) {
        return -1;
    }
    for (int i = 1; const char *member = KLIBCSzListGet(words, i); ++i) {
        if (strcmp(member, szIfname) == 0) {
            return 1;
        }
    }
    return 0;
}

} // namespace

bool is_ovs_bond_member(const place &at, const char *szIfname) {
    constexpr char kBonds[] = "/sys/class/net/kova_ovs_bonds";
    const stream file{fopen(kBonds, "re")};
    if (!file.is_held()) {
        if (errno != ENOENT) {
            fail(at, NET_ERR_FILE_OPEN, 0, "Failed to open %s.", kBonds);
        }
        return false;
    }
    const string_list words = make_list();
    int found = words.is_held() ? 0 : -1;
    while (found == 0) {
        const heap<char> line = next_line(file);
        if (line == nullptr) {
            return false;
        }
        found = names_member(line.get(), szIfname, words.get());
    }
    if (found < 0) {
        fail(at, NET_ERR_OUT_OF_MEMORY, 0, "Failed to alloc memory.");
    }
    return found > 0;
}

} // namespace kova
