#include <kovanetsdk/hostname.h>

#include "core/guards.h"
#include "core/report.h"

#include <cstring>

using namespace kova;

extern "C" int KOVALnxGetHostname(char *szHostname) {
    if (refuses_null_text(HERE, "szHostname", szHostname)) {
        return -1;
    }
    const named_lock lock{kConfigShared};
    if (!lock.is_held()) {
        return fail_lock(HERE, lock.result());
    }
    char name[64];
    errno = 0; // a name that was cut may show in errno alone
    if (gethostname(name, sizeof name) != 0 || errno == ENAMETOOLONG) {
        return fail_quietly(HERE, NET_ERR_SYSCALL, -1);
    }
    name[sizeof name - 1] = '\0';
    const size_t length = strcspn(name, ".");
    memcpy(szHostname, name, length);
    szHostname[length] = '\0';
    return length > 0 ? 1 : 0;
}
