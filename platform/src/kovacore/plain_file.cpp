#include "kova/core.h"

#include <algorithm>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <string_view>
#include <sys/random.h>
#include <sys/stat.h>

#include "common/list_ptr.h"
#include "common/report.h"
#include "common/views.h"
#include "kovacore/file_rewrite.h"
#include "kovacore/line_source.h"

using namespace kova;
using std::string_view;

namespace {

enum enum_flags { kAnyType = 64, kRegularFiles = 1154 };
enum line_flags { kBeginsWith = 2, kBeginsWithField = 1026 };

struct directory_closer {
    void operator()(DIR *directory) const { closedir(directory); }
};
using directory_ptr = std::unique_ptr<DIR, directory_closer>;

bool is_regular(DIR *directory, const dirent &entry) {
    if (entry.d_type != DT_UNKNOWN)
        return entry.d_type == DT_REG;
    struct stat status;
    return fstatat(dirfd(directory), entry.d_name, &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISREG(status.st_mode);
}

/** @return 0 or -1 */
int collect_names(DIR *directory, string_view prefix, bool regular_only, KLIBSZLIST *names) {
    errno = 0;
    while (const dirent *entry = readdir(directory)) {
        const bool wanted = entry->d_name[0] != '.' && begins_with(entry->d_name, prefix) &&
                            (!regular_only || is_regular(directory, *entry));
        if (wanted && KLIBCSzListPush(&names, entry->d_name) < 0)
            return -1;
        errno = 0;
    }
    return errno == 0 ? 0 : fail(HERE, kErrFileOpen);
}

bool comes_before(const char *left, const char *right) {
    return strcmp(left, right) < 0;
}

string_view without_newline(string_view line) {
    while (line.ends_with('\n') || line.ends_with('\r'))
        line.remove_suffix(1);
    return line;
}

bool matches(string_view line, string_view prefix, bool whole_field) {
    if (!begins_with(line, prefix))
        return false;
    line.remove_prefix(prefix.size());
    return !whole_field || line.empty() || line.starts_with(',') || line == "\r";
}

void add_line_behind(file_rewrite &file, const char *marker, string_view line) {
    bool added = false;
    string_view rest = file.old_text();
    while (!rest.empty()) {
        const string_view old_line{rest.data(), std::min(rest.find('\n'), rest.size())};
        file.fresh().add_line(old_line);
        rest.remove_prefix(std::min(old_line.size() + 1, rest.size()));
        if (!added && marker != nullptr && without_newline(old_line) == without_newline(marker)) {
            file.fresh().add_line(line);
            added = true;
        }
    }
    if (!added)
        file.fresh().add_line(line);
}

} // namespace

int KLIBCFileExist(const char *szPath) {
    struct stat status;
    if (is_empty(szPath))
        return fail(HERE, kErrArgument), 0;
    return stat(szPath, &status) == 0;
}

int KLIBCFileCheckDir(const char *szPath) {
    struct stat status;
    if (is_empty(szPath))
        return fail(HERE, kErrArgument), 0;
    return stat(szPath, &status) == 0 && S_ISDIR(status.st_mode);
}

int KLIBCFileTouch(const char *szPath) {
    if (is_empty(szPath))
        return fail(HERE, kErrArgument);

    struct stat status;
    if (stat(szPath, &status) == 0)
        return S_ISDIR(status.st_mode) ? fail(HERE, kErrFileOpen) : 0;
    file_rewrite file;
    return file.open(szPath) < 0 ? -1 : file.create(0644);
}

int KLIBCFileEnumDir(const char *szDir, KLIBSZLIST *pList, const char *szPrefix, int flags) {
    if (is_empty(szDir) || pList == nullptr || (flags != kAnyType && flags != kRegularFiles))
        return fail(HERE, kErrArgument);

    const directory_ptr directory{opendir(szDir)};
    if (!directory)
        return fail(HERE, kErrFileOpen);
    const list_ptr names{KLIBCSzListAlloc(64)};
    if (!names ||
        collect_names(directory.get(), is_empty(szPrefix) ? "" : szPrefix, flags == kRegularFiles, names.get()))
        return -1;
    std::sort(names->ppszItem, names->ppszItem + names->nItem, comes_before);
    for (uint32_t i = 0; i < names->nItem; i++)
        if (KLIBCSzListPush(&pList, names->ppszItem[i]) < 0)
            return -1;
    return static_cast<int>(names->nItem);
}

int KLIBCFileGetLine(const char *szPath, const char *szPrefix, char *szLine, int cbLine, int flags) {
    if (is_empty(szPath) || is_empty(szPrefix) || szLine == nullptr || cbLine < 1)
        return fail(HERE, kErrArgument);
    if (flags != kBeginsWith && flags != kBeginsWithField)
        return fail(HERE, kErrArgument);

    szLine[0] = '\0';
    line_source source{szPath};
    string_view line;
    while (source.next(line)) {
        if (!matches(line, szPrefix, flags == kBeginsWithField))
            continue;
        line = without_newline(line);
        const size_t length = std::min(line.size(), static_cast<size_t>(cbLine) - 1);
        memcpy(szLine, line.data(), length);
        szLine[length] = '\0';
        return 1;
    }
    return source.failed() ? fail(HERE, kErrFileOpen) : 0;
}

int KLIBCFileReadLines(const char *szPath, KLIBSZLIST *pList) {
    if (is_empty(szPath) || pList == nullptr)
        return fail(HERE, kErrArgument);

    const heap_ptr<char> text{static_cast<char *>(malloc(line_source::kLineMax + 1))};
    if (!text)
        return fail(HERE, kErrMemory);
    line_source source{szPath};
    string_view line;
    int count = 0;
    while (source.next(line)) {
        line = without_newline(line);
        memcpy(text.get(), line.data(), line.size());
        text.get()[line.size()] = '\0';
        if (KLIBCSzListPush(&pList, text.get()) < 0)
            return -1;
        count++;
    }
    return source.failed() ? fail(HERE, kErrFileOpen) : count;
}

int KLIBCFileAddLine(const char *szPath, const char *szMarker, const char *szLine, int flags) {
    if (is_empty(szPath) || is_empty(szLine) || (flags != 0 && flags != 512))
        return fail(HERE, kErrArgument);
    const string_view line = without_newline(szLine);
    if (line.find('\n') != string_view::npos || (szMarker != nullptr && *szMarker == '\0'))
        return fail(HERE, kErrArgument);

    file_rewrite file;
    if (file.open(szPath) < 0)
        return -1;
    add_line_behind(file, szMarker, line);
    return file.commit();
}

int KLIBCFileReplaceSubStr(const char *szPath, const char *szOld, const char *szNew) {
    if (is_empty(szPath) || is_empty(szOld) || szNew == nullptr)
        return fail(HERE, kErrArgument);

    file_rewrite file;
    if (file.open(szPath) < 0)
        return -1;
    if (!file.existed())
        return fail(HERE, kErrFileOpen);
    string_view rest = file.old_text();
    const string_view old_text{szOld};
    for (size_t at = rest.find(old_text); at != string_view::npos; at = rest.find(old_text)) {
        file.fresh().add({rest.data(), at});
        file.fresh().add(szNew);
        rest.remove_prefix(at + old_text.size());
    }
    file.fresh().add(rest);
    return file.commit();
}

FILE *KLIBCFileTempFileOpen(char *szTemplate) {
    if (is_empty(szTemplate) || !ends_in(szTemplate, "XXXXXX"))
        return fail(HERE, kErrArgument), nullptr;

    unique_fd fd{mkostemp(szTemplate, O_CLOEXEC)};
    if (!fd)
        return fail(HERE, kErrFileOpen), nullptr;
    FILE *stream = fdopen(fd.get(), "w");
    if (stream == nullptr) {
        unlink(szTemplate);
        return fail(HERE, kErrFileOpen), nullptr;
    }
    (void)fd.release();
    return stream;
}

int KLIBCFileITmpName(const char *szTarget, char *szTmp, int cbTmp) {
    if (is_empty(szTarget) || szTmp == nullptr || cbTmp < 1)
        return fail(HERE, kErrArgument);

    szTmp[0] = '\0';
    const char *slash = strrchr(szTarget, '/');
    const char *name = slash != nullptr ? slash + 1 : szTarget;
    uint64_t number;
    if (*name == '\0' || getrandom(&number, sizeof number, 0) != sizeof number)
        return fail(HERE, kErrArgument);
    const int length = snprintf(szTmp, static_cast<size_t>(cbTmp), "%.*s.%s.%016llx", static_cast<int>(name - szTarget),
                                szTarget, name, static_cast<unsigned long long>(number));
    if (length < cbTmp)
        return 0;
    szTmp[0] = '\0';
    return fail(HERE, kErrArgument);
}
