// Preloaded to tests while lines are counted: a child that leaves by _exit would take what it has counted with it. One
// that has given up its privileges cannot write, and does take it with it.
#include <dlfcn.h>
#include <sys/syscall.h>
#include <unistd.h>

static constexpr const char *kCounting[] = {"libkovanetsdk.so.6", "libkovacore.so.6", "libkovasdk.so.6",
                                            "libkovahacore.so.6", "libkovadhmxcore.so.6"};

extern "C" void _exit(int status) {
    for (const char *library : kCounting) {
        void *const loaded = dlopen(library, RTLD_LAZY | RTLD_NOLOAD);
        void *const dump = loaded != nullptr && geteuid() == 0 ? dlsym(loaded, "__gcov_dump") : nullptr;
        if (dump != nullptr) {
            reinterpret_cast<void (*)()>(dump)();
        }
    }
    syscall(SYS_exit_group, status);
    __builtin_unreachable();
}
