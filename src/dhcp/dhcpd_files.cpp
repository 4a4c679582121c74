#include "dhcp/dhcpd_files.h"

#include <cstring>

namespace kova {

int make_dhcpd_dir(const place &at) {
    if (KLIBCExec("/bin/mkdir", "-p", kDhcpdDir, nullptr, nullptr) != 0) {
        return fail_keeping_code(at, -1, "Failed to mkdir [%s]", kDhcpdDir);
    }
    return 0;
}

bool is_line_text(const char *text) {
    for (const char *byte = text; *byte != '\0'; ++byte) {
        if (static_cast<unsigned char>(*byte) < ' ' || *byte == '\x7f') {
            return false;
        }
    }
    return true;
}

bool is_line_field(const char *text) {
    return *text != '\0' && is_line_text(text) && strchr(text, ',') == nullptr;
}

bool next_cut_line(const stream &file, char (&line)[kLineRoom]) {
    if (fgets(line, sizeof line, file.get()) == nullptr) {
        return false;
    }
    char *const newline = strchr(line, '\n');
    if (newline != nullptr) {
        *newline = '\0';
        return true;
    }
    for (int byte = getc(file.get()); byte != EOF && byte != '\n'; byte = getc(file.get())) {
    }
    return true;
}

} // namespace kova
