#include "core/host_names.h"

#include <arpa/inet.h>
#include <cstring>

namespace kova {

namespace {

constexpr int kLineSize = 1024;
/** More than a network of hosts can answer; a tool that never ends its output is left then. */
constexpr long kMostLines = 65536;

} // namespace

netbios_answers::netbios_answers(const place &at, const char *szName) : pattern_("%s<", szName) {
    constexpr char kTool[] = "/usr/bin/nmblookup";
    if (!pattern_.fits() || *szName == '-') {
        return;
    }
    tool_ = process_stream{KLIBCPopen(kTool, "r", szName, static_cast<const char *>(nullptr))};
    if (!tool_.is_held()) {
        log_info(at, "Fail to execute [%s], kovaerr=[0x%04X]", kTool, KLIBCErrGet());
        return;
    }
    line_.reset(static_cast<char *>(malloc(kLineSize)));
    if (line_ == nullptr) {
        fail(at, NET_ERR_OUT_OF_MEMORY, 0, "pszBuf is NULL");
        return;
    }
    lines_ = bounded_lines{tool_.get(), line_.get(), kLineSize, kMostLines * kLineSize};
}

bool netbios_answers::next(in_addr &address) {
    while (lines_.next()) {
        char field[INET_ADDRSTRLEN + 1]; // one more than an address needs, so that no longer word is cut to one
        if (strstr(line_.get(), pattern_.c_str()) != nullptr && sscanf(line_.get(), "%16s", field) == 1 &&
            inet_pton(AF_INET, field, &address) == 1) {
            return true;
        }
    }
    return false;
}

} // namespace kova
