// What a program pays for being linked with the library.
#include "rows.h"
#include "world.h"

#include <dlfcn.h>
#include <filesystem>
#include <kovanetsdk/addr.h>

namespace kova {

namespace {

std::string program_beside(const char *name) {
    return std::filesystem::read_symlink("/proc/self/exe").parent_path() / name;
}

sides linked_against_plain() {
    return {time_of_run({program_beside("kova-bench-linked")}), time_of_run({program_beside("kova-bench-plain")})};
}

/** The library as this process runs it. */
std::string path_of_library() {
    Dl_info info;
    require_done(dladdr(reinterpret_cast<void *>(&BlKLIBIsIpAddr), &info) != 0, "the library is not loaded");
    return std::filesystem::canonical(info.dli_fname);
}

sides size_against_limit() {
    constexpr double kLimit = 400 * 1024;
    const std::string stripped = "/tmp/stripped";
    run_program({"strip", "-o", stripped, path_of_library()}, "");
    const auto size = static_cast<double>(std::filesystem::file_size(stripped));
    return {[size] { return size; }, [] { return kLimit; }};
}

} // namespace

contests load_contests() {
    return {
        {"load", "plain", "start of a program linked with the library", "of one that is not", std::nullopt, 100,
         linked_against_plain},
        {"size", "limit", "the library, stripped", "400 KiB", 1.0, 1, size_against_limit, "bytes"},
    };
}

} // namespace kova
