#include "kova/core.h"

#include <algorithm>
#include <cstring>
#include <span>
#include <string_view>

#include "common/report.h"
#include "common/views.h"
#include "kovacore/file_rewrite.h"
#include "kovacore/line_source.h"
#include "kovacore/sz_hash.h"

using namespace kova;
using std::string_view;

namespace {

constexpr const char *kInfoFile = "/etc/kovainfo.conf";
constexpr const char *kQuotedFormat = "%s=\"%s\"\n";
constexpr const char *kPlainFormat = "%s=%s\n";

/** Takes the text off the front when it is there. */
bool take_prefix(string_view &line, string_view prefix) {
    if (!begins_with(line, prefix))
        return false;
    line.remove_prefix(prefix.size());
    return true;
}

bool has_key(string_view line, string_view key) {
    return take_prefix(line, key) && line.starts_with('=');
}

/** A key that itself holds "=" names a whole field: "...:MSFT,1" is neither "...:MSFT,12" nor "...:MSFT2,1". */
bool is_removed(string_view line, string_view key) {
    if (key.find('=') == string_view::npos)
        return has_key(line, key);
    return take_prefix(line, key) && (line.empty() || line.starts_with(',') || line.starts_with('\r'));
}

string_view bare_value(string_view value) {
    while (value.ends_with('\r'))
        value.remove_suffix(1);
    if (value.size() >= 2 && value.starts_with('"') && value.ends_with('"')) {
        value.remove_prefix(1);
        value.remove_suffix(1);
    }
    return value;
}

/** @return 1 with the value, 0 when the key is absent, below 0 for an unreadable file */
int find_value(line_source &source, string_view key, string_view &value) {
    string_view line;
    while (source.next(line)) {
        if (!has_key(line, key))
            continue;
        line.remove_prefix(key.size() + 1);
        value = bare_value(line);
        return 1;
    }
    return source.failed() ? fail(HERE, kErrFileOpen) : 0;
}

bool is_control(char c) {
    return static_cast<unsigned char>(c) < ' ' || c == '\x7f';
}

bool is_bad_key(const char *key) {
    return is_empty(key) || *key == '=' || std::any_of(key, key + strlen(key), is_control);
}

bool is_bad_value(const char *value) {
    return value == nullptr || strpbrk(value, "\r\n") != nullptr;
}

bool is_bad_format(const char *format) {
    return format == nullptr || (strcmp(format, kQuotedFormat) != 0 && strcmp(format, kPlainFormat) != 0);
}

/** The changes of one rewrite. */
struct key_changes {
    std::span<const hash_entry> set;
    std::span<const hash_entry> removed;
    bool quoted;
};

void add_entry(text_buffer &text, const hash_entry &entry, bool quoted) {
    text.add(entry.key);
    text.add(quoted ? "=\"" : "=");
    text.add(entry.value);
    text.add(quoted ? "\"\n" : "\n");
}

/** Hands one line of the old text on: as it is, with its new value, or not at all. */
void convert_line(text_buffer &text, string_view line, const key_changes &changes, bool *written) {
    for (size_t i = 0; i < changes.set.size(); i++) {
        if (!has_key(line, changes.set[i].key))
            continue;
        if (!written[i])
            add_entry(text, changes.set[i], changes.quoted);
        written[i] = true;
        return;
    }
    for (const hash_entry &entry : changes.removed)
        if (is_removed(line, entry.key))
            return;
    text.add_line(line);
}

int rewrite_keys(const char *path, const key_changes &changes) {
    file_rewrite file;
    if (file.open(path) < 0)
        return -1;
    const heap_ptr<bool> written{static_cast<bool *>(calloc(changes.set.size() + 1, sizeof(bool)))};
    if (!written)
        return fail(HERE, kErrMemory);

    string_view rest = file.old_text();
    while (!rest.empty()) {
        const string_view line{rest.data(), std::min(rest.find('\n'), rest.size())};
        convert_line(file.fresh(), line, changes, written.get());
        rest.remove_prefix(std::min(line.size() + 1, rest.size()));
    }
    for (size_t i = 0; i < changes.set.size(); i++)
        if (!written.get()[i])
            add_entry(file.fresh(), changes.set[i], changes.quoted);
    return file.commit();
}

} // namespace

int KLIBCFileGetKeyValue(const char *szPath, const char *szKey, char *szValue, int cbValue, int flags) {
    if (is_empty(szPath) || is_empty(szKey) || szValue == nullptr || cbValue < 1 || flags != 0)
        return fail(HERE, kErrArgument);

    szValue[0] = '\0';
    line_source source{szPath};
    string_view value;
    const int result = find_value(source, szKey, value);
    if (result > 0) {
        const size_t length = std::min(value.size(), static_cast<size_t>(cbValue) - 1);
        memcpy(szValue, value.data(), length);
        szValue[length] = '\0';
    }
    return result;
}

int KLIBCFileSetKeyValue(const char *szPath, const char *szKey, const char *szValue, const char *szFormat) {
    if (is_empty(szPath) || is_bad_key(szKey) || is_bad_value(szValue) || is_bad_format(szFormat))
        return fail(HERE, kErrArgument);

    const hash_entry entry = {const_cast<char *>(szKey), const_cast<char *>(szValue)};
    return rewrite_keys(szPath, {{&entry, 1}, {}, strcmp(szFormat, kQuotedFormat) == 0});
}

int KLIBCFileSetKeys(const char *szPath, const KLIBSZHASH *pSet, const KLIBSZHASH *pRemove, const char *szFormat) {
    if (is_empty(szPath) || is_bad_format(szFormat))
        return fail(HERE, kErrArgument);
    for (const hash_entry &entry : hash_entries(pSet))
        if (is_bad_key(entry.key) || is_bad_value(entry.value))
            return fail(HERE, kErrArgument);
    for (const hash_entry &entry : hash_entries(pRemove))
        if (is_bad_key(entry.key))
            return fail(HERE, kErrArgument);

    return rewrite_keys(szPath, {hash_entries(pSet), hash_entries(pRemove), strcmp(szFormat, kQuotedFormat) == 0});
}

int KLIBCFileRemoveKey(const char *szPath, const char *szKey) {
    if (is_empty(szPath) || is_bad_key(szKey))
        return fail(HERE, kErrArgument);
    if (access(szPath, F_OK) < 0 && errno == ENOENT)
        return 0;

    const hash_entry entry = {const_cast<char *>(szKey), nullptr};
    return rewrite_keys(szPath, {{}, {&entry, 1}, false});
}

int KLIBCFileCheckKeyValue(const char *szPath, const char *szKey, const char *szExpected, int flags) {
    if (is_empty(szPath) || is_empty(szKey) || szExpected == nullptr || flags != 0)
        return fail(HERE, kErrArgument);

    line_source source{szPath};
    string_view value;
    const int result = find_value(source, szKey, value);
    return result > 0 ? value == szExpected : result;
}

int KLIBCINFOSetKeyValue(const char *szKey, const char *szValue) {
    return KLIBCFileSetKeyValue(kInfoFile, szKey, szValue, kQuotedFormat);
}

int KLIBCINFORemoveKey(const char *szKey) {
    return KLIBCFileRemoveKey(kInfoFile, szKey);
}
