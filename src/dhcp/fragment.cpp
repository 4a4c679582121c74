#include "dhcp/fragment.h"

#include "core/ifcfg.h"
#include "core/kernel_files.h"
#include "dhcp/dhcpd_files.h"

namespace kova {

bool is_line_text(const char *text) {
    for (const char *byte = text; *byte != '\0'; ++byte) {
        if (static_cast<unsigned char>(*byte) < ' ' || *byte == '\x7f') {
            return false;
        }
    }
    return true;
}

bool is_list_field(const char *text) {
    return *text != '\0' && is_line_text(text) && strchr(text, ',') == nullptr;
}

void fragment::write_enable(bool is_on) {
    fprintf(file_.get(), kQuotedLine, kEnable, yes_or_no(is_on));
}

void fragment::write_interface(const char *ifname) {
    fprintf(file_.get(), kPlainLine, daemon_key::kInterface, ifname);
}

void fragment::write_range(const char *tag, const char *start, const char *end, const char *mask, int lease_time) {
    fprintf(file_.get(), "dhcp-range=set:%s,%s,%s,%s,%d\n", tag, start, end, mask, lease_time);
}

void fragment::write_option(const char *tag, const char *name, const char *value) {
    fprintf(file_.get(), "dhcp-option=tag:%s,%s,%s\n", tag, name, value);
}

void fragment::write_option(const char *tag, const char *name, const char *first, const char *second) {
    fprintf(file_.get(), "dhcp-option=tag:%s,%s,%s,%s\n", tag, name, first, second);
}

bool fragment::close() {
    return close_written(file_);
}

comma_fields::comma_fields(const char *text)
    : list_(make_list()), count_(list_.is_held() ? split_fields(text, ",", list_.get()) : -1) {}

const char *comma_fields::operator[](int index) const {
    const char *const field = is_held() ? KLIBCSzListGet(list_.get(), index) : nullptr;
    return field != nullptr ? field : "";
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

heap<char> line_holding(const path_text &path, const char *text) {
    const stream file{fopen(path.c_str(), "re")};
    heap<char> line = file.is_held() ? next_line(file) : nullptr;
    while (line != nullptr && strstr(line.get(), text) == nullptr) {
        line = next_line(file);
    }
    if (line != nullptr) {
        line.get()[strcspn(line.get(), "\r")] = '\0'; // written elsewhere, perhaps
    }
    return line;
}

bool read_option(const path_text &path, const char *name, char *out, size_t size) {
    const heap<char> line = line_holding(path, name);
    if (line == nullptr) {
        return false;
    }
    const char *const comma = strrchr(line.get(), ',');
    copy_cut(out, size, comma != nullptr ? comma + 1 : line.get());
    return true;
}

} // namespace kova
