#include "kova/core.h"

#include <cstring>

#include "common/report.h"

using namespace kova;

namespace {

constexpr const char *kBlanks = " \t\r\n\v\f";

} // namespace

char *KLIBCStrTok(char *szText, const char *szDelimiters, char **ppSave) {
    if (szDelimiters == nullptr || ppSave == nullptr)
        return fail(HERE, kErrArgument), nullptr;
    if (szText == nullptr && *ppSave == nullptr)
        return nullptr;
    return strtok_r(szText, szDelimiters, ppSave);
}

char *KLIBCStrSep(char *szText, const char *szSeparators, char **ppSave) {
    if (szSeparators == nullptr || ppSave == nullptr)
        return fail(HERE, kErrArgument), nullptr;
    if (szText != nullptr)
        *ppSave = szText;
    return strsep(ppSave, szSeparators);
}

char *KLIBCStrTokIndex(char *szText, int index) {
    if (szText == nullptr || index < 0)
        return fail(HERE, kErrArgument), nullptr;

    char *token = szText + strspn(szText, kBlanks);
    for (int i = 0; i < index && *token != '\0'; i++) {
        token += strcspn(token, kBlanks);
        token += strspn(token, kBlanks);
    }
    if (*token == '\0')
        return nullptr;
    token[strcspn(token, kBlanks)] = '\0';
    return token;
}

char *KLIBCStrTrimSpace(const char *szText, char *szOut) {
    if (szText == nullptr || szOut == nullptr)
        return fail(HERE, kErrArgument), nullptr;

    const char *begin = szText + strspn(szText, kBlanks);
    size_t length = strlen(begin);
    while (length > 0 && strchr(kBlanks, begin[length - 1]) != nullptr)
        length--;
    memmove(szOut, begin, length);
    szOut[length] = '\0';
    return szOut;
}
