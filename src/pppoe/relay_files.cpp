#include "pppoe/relay_files.h"

#include <cerrno>
#include <kova/core.h>
#include <sys/stat.h>

namespace kova {

bool has_relay_directory(mode_t mode) {
    if (KLIBCFileCheckDir(kRelayDirectory) == 1 || mkdir(kRelayDirectory, mode) == 0) {
        return true;
    }
    return errno == EEXIST && KLIBCFileCheckDir(kRelayDirectory) == 1; // made by somebody else meanwhile
}

} // namespace kova
