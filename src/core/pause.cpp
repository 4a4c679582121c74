#include "core/pause.h"

#include <cerrno>

namespace kova {

void pause_for(timespec time) {
    while (nanosleep(&time, &time) != 0 && errno == EINTR) {
        // goes on with what is left
    }
}

} // namespace kova
