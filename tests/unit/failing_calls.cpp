/**
 * @file
 * More calls that a unit test can make fail: those that bring a file to its place, the host name, entries of lists, and
 * one of the library's own that fails for no name of an interface.
 */
#include "support/fault_points.h"

#include <cstdio>
#include <dlfcn.h>
#include <kova/core.h>
#include <kovanetsdk/iface.h>
#include <sys/stat.h>
#include <unistd.h>

using kova_test::can_fail;
using kova_test::current_rig;

namespace {

bool is_failing(const char *operation) {
    return current_rig != nullptr && current_rig->is_failing(operation);
}

/** The definition that this one stands before. */
template<typename Function> Function *real(const char *name) {
    return reinterpret_cast<Function *>(dlsym(RTLD_NEXT, name));
}

int failure(int error) {
    errno = error;
    return -1;
}

const bool known[] = {can_fail("fsync"),
                      can_fail("fclose"),
                      can_fail("rename"),
                      can_fail("chmod"),
                      can_fail("sethostname"),
                      can_fail("KLIBCSzListGet"),
                      can_fail("KLIBNetOVSGetOriginalIf")};

} // namespace

extern "C" int fsync(int fd) {
    return is_failing("fsync") ? failure(EIO) : real<int(int)>("fsync")(fd);
}

/** The stream is closed all the same. */
extern "C" int fclose(FILE *stream) {
    static const auto next = real<int(FILE *)>("fclose");
    const bool fails = is_failing("fclose");
    const int result = next(stream);
    return fails ? failure(EIO) : result;
}

extern "C" int rename(const char *from, const char *to) noexcept {
    return is_failing("rename") ? failure(EBUSY) : real<int(const char *, const char *)>("rename")(from, to);
}

extern "C" int chmod(const char *path, mode_t mode) noexcept {
    return is_failing("chmod") ? failure(EPERM) : real<int(const char *, mode_t)>("chmod")(path, mode);
}

extern "C" int stat(const char *path, struct stat *status) noexcept {
    const auto next = real<int(const char *, struct stat *)>("stat");
    return current_rig == nullptr ? next(path, status) : next(current_rig->redirected(path).c_str(), status);
}

extern "C" const char *KLIBCSzListGet(const KLIBSZLIST *list, int index) {
    static const auto next = real<const char *(const KLIBSZLIST *, int)>("KLIBCSzListGet");
    return is_failing("KLIBCSzListGet") ? nullptr : next(list, index);
}

extern "C" int KLIBNetOVSGetOriginalIf(const char *szIfname, char *szOut, int size) {
    static const auto next = real<int(const char *, char *, int)>("KLIBNetOVSGetOriginalIf");
    return is_failing("KLIBNetOVSGetOriginalIf") ? -1 : next(szIfname, szOut, size);
}

extern "C" int sethostname(const char *name, size_t size) noexcept {
    return is_failing("sethostname") ? failure(EPERM) : real<int(const char *, size_t)>("sethostname")(name, size);
}

extern "C" int gethostname(char *name, size_t size) noexcept {
    if (current_rig != nullptr && current_rig->is_observing && current_rig->on_gethostname) {
        return current_rig->on_gethostname(name, size);
    }
    return real<int(char *, size_t)>("gethostname")(name, size);
}
