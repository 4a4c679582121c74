#include "pppoe/pppoe_files.h"

#include <cstring>

namespace kova {

quoted_user::quoted_user(const char *szUser) {
    constexpr int kLastForByte = 509;
    constexpr int kLastForQuote = 505;
    append("'");
    for (; *szUser != '\0'; ++szUser) {
        const char byte[] = {*szUser, '\0'};
        const bool is_quote = *szUser == '\'';
        if (length_ > (is_quote ? kLastForQuote : kLastForByte)) {
            break;
        }
        append(is_quote ? "'\"'\"'" : byte);
    }
    append("'");
}

void quoted_user::append(const char *bytes) {
    const int length = static_cast<int>(strlen(bytes));
    memcpy(text_ + length_, bytes, static_cast<size_t>(length) + 1);
    length_ += length;
}

void unquote(char *text) {
    char quote = '\0';
    char *to = text;
    for (const char *from = text; *from != '\0'; ++from) {
        const bool is_quote = *from == '\'' || *from == '"';
        if (quote == '\0' && is_quote) {
            quote = *from;
        } else if (*from == quote) {
            quote = '\0';
        } else {
            *to++ = *from;
        }
    }
    *to = '\0';
}

char *end_of_quoted(char *text, const char *ends) {
    char quote = '\0';
    for (; *text != '\0'; ++text) {
        if (quote != '\0') {
            quote = *text == quote ? '\0' : quote;
        } else if (*text == '\'' || *text == '"') {
            quote = *text;
        } else if (strchr(ends, *text) != nullptr) {
            break;
        }
    }
    return text;
}

} // namespace kova
