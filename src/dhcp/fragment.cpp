#include "dhcp/fragment.h"

#include "core/ifcfg.h"
#include "core/kernel_files.h"
#include "dhcp/dhcpd_files.h"

namespace kova {

namespace {

constexpr char kOptionLine[] = "dhcp-option=tag:%s,%s,%s\n";

} // namespace

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

bool is_one_line(const char *tag, const char *name, const char *value) {
    return built_text<kLineRoom + 1>{kOptionLine, tag, name, value}.fits();
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

void fragment::write_advertised_range(const char *tag, const char *ifname, const char *mode, int lease_time) {
    fprintf(file_.get(), "dhcp-range=set:%s,::,constructor:%s,%s,64,%d\n", tag, ifname, mode, lease_time);
}

void fragment::write_option(const char *tag, const char *name, const char *value) {
    fprintf(file_.get(), kOptionLine, tag, name, value);
}

void fragment::write_option(const char *tag, const char *name, const char *first, const char *second) {
    fprintf(file_.get(), "dhcp-option=tag:%s,%s,%s,%s\n", tag, name, first, second);
}

void fragment::write_enable_ra() {
    fputs("enable-ra\n", file_.get());
}

bool fragment::close() {
    return close_written(file_);
}

comma_fields::comma_fields(const char *text)
    : list_(text != nullptr ? make_list() : string_list{}),
      count_(list_.is_held() ? split_fields(text, ",", list_.get()) : -1) {}

const char *comma_fields::operator[](int index) const {
    const char *const field = is_held() ? KLIBCSzListGet(list_.get(), index) : nullptr;
    return field != nullptr ? field : "";
}

bool next_cut_line(const stream &file, char (&line)[kLineRoom]) {
    int byte = getc(file.get());
    const bool is_there = byte != EOF;
    size_t length = 0;
    for (; byte != EOF && byte != '\n'; byte = getc(file.get())) {
        if (length < sizeof line - 1) {
            line[length++] = static_cast<char>(byte);
        }
    }
    if (length > 0 && line[length - 1] == '\r') { // written elsewhere, perhaps
        --length;
    }
    line[length] = '\0';
    return is_there;
}

found_line line_holding(const path_text &path, const char *text) {
    const stream file{fopen(path.c_str(), "re")};
    if (!file.is_held()) {
        return {nullptr, false};
    }
    heap<char> line = next_line(file);
    while (line != nullptr && strstr(line.get(), text) == nullptr) {
        line = next_line(file);
    }
    if (line == nullptr) {
        return {nullptr, feof(file.get()) != 0};
    }
    line.get()[strcspn(line.get(), "\r")] = '\0'; // written elsewhere, perhaps
    return {std::move(line), true};
}

comma_fields fields_of_line(const path_text &path, const char *text) {
    return comma_fields{line_holding(path, text).text.get()};
}

comma_fields fields_of_range(const path_text &path) {
    char value[kLineRoom];
    const bool is_there = KLIBCFileGetKeyValue(path.c_str(), daemon_key::kRange, value, sizeof value, 0) > 0;
    return comma_fields{is_there ? value : nullptr};
}

bool read_v4_range(const path_text &path, DHCP_TAG_CONF &conf) {
    const comma_fields fields = fields_of_range(path);
    copy_cut(conf.start_ip, kAddressRoom, fields[1]);
    copy_cut(conf.end_ip, kAddressRoom, fields[2]);
    copy_cut(conf.netmask, kAddressRoom, fields[3]);
    leading_number(fields[4], conf.lease_time);
    return fields.is_held();
}

int read_option(const path_text &path, const char *name, char *out, size_t size) {
    const found_line line = line_holding(path, name);
    if (line.text == nullptr) {
        return line.is_read ? 0 : -1;
    }
    const char *const comma = strrchr(line.text.get(), ',');
    copy_cut(out, size, comma != nullptr ? comma + 1 : line.text.get());
    return 1;
}

} // namespace kova
