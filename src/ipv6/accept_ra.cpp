#include "ipv6/accept_ra.h"

#include "core/guards.h"

#include <kovanetsdk/core.h>

namespace kova {

uint32_t write_accept_ra(const accept_ra_path &path, bool accepts) {
    constexpr int kAlways = 2; // also where the machine forwards
    constexpr int kNever = 0;
    const stream file{fopen(path.c_str(), "we")};
    if (!file.is_held()) {
        return NET_ERR_FILE_OPEN;
    }
    const bool is_written = fprintf(file.get(), "%d", accepts ? kAlways : kNever) > 0 && fflush(file.get()) == 0;
    return is_written ? 0 : NET_ERR_FILE_WRITE;
}

} // namespace kova
