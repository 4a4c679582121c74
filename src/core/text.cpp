#include "core/text.h"

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

} // namespace kova
