#include "core/text.h"

#include "core/guards.h"

#include <cstring>

namespace kova {

bool copy_whole(char *out, int size, const char *text) {
    if (strlen(text) >= static_cast<size_t>(size)) {
        *out = '\0';
        return false;
    }
    memcpy(out, text, strlen(text) + 1);
    return true;
}

int split(char *text, const char *delimiters, KLIBSZLIST *words) {
    int number = 0;
    char *rest = nullptr;
    for (const char *word = KLIBCStrTok(text, delimiters, &rest); word != nullptr;
         word = KLIBCStrTok(nullptr, delimiters, &rest)) {
        if (KLIBCSzListPush(&words, word) < 0) {
            return -1;
        }
        ++number;
    }
    return number;
}

int split_fields(const char *text, const char *separators, KLIBSZLIST *fields) {
    const heap<char> copy{strdup(text)};
    if (copy == nullptr) {
        return -1;
    }
    int number = 0;
    char *rest = nullptr;
    for (const char *field = KLIBCStrSep(copy.get(), separators, &rest); field != nullptr;
         field = KLIBCStrSep(nullptr, separators, &rest)) {
        if (KLIBCSzListPush(&fields, field) < 0) {
            return -1;
        }
        ++number;
    }
    return number;
}

} // namespace kova
