#include "dns/resolver_file.h"

namespace kova {

int fill_resolver_file(const place &at, const replacement_file &file, const KLIBSZLIST *servers,
                       const KLIBSZLIST *extra_lines) {
    if (!file.is_open()) {
        return fail_quietly(at, NET_ERR_FILE_OPEN, -1);
    }
    for (int i = 0; i < count_of(servers); ++i) {
        fprintf(file.get(), "nameserver\t%s\n", KLIBCSzListGet(servers, i));
    }
    for (int i = 0; i < count_of(extra_lines); ++i) {
        fprintf(file.get(), "%s\n", KLIBCSzListGet(extra_lines, i));
    }
    return file.finish() ? 0 : fail_quietly(at, NET_ERR_FILE_WRITE, -1);
}

} // namespace kova
