#include "stored.h"

#include "errors.h"

#include <filesystem>
#include <kova/core.h>

namespace kova {

std::string stored_value(const std::string &file, const std::string &key) {
    char value[1024] = "";
    clear_error();
    if (KLIBCFileExist(file.c_str()) == 1 &&
        KLIBCFileGetKeyValue(file.c_str(), key.c_str(), value, sizeof value, 0) < 0) {
        call_failed("cannot read " + key + " of " + file);
    }
    return value;
}

void require_readable(const std::string &file) {
    char value[8] = "";
    clear_error();
    if (KLIBCFileExist(file.c_str()) == 1 && KLIBCFileGetKeyValue(file.c_str(), "-", value, sizeof value, 0) < 0) {
        call_failed("cannot read " + file);
    }
}

std::vector<std::string> names_in(const std::string &folder) {
    std::vector<std::string> names;
    std::error_code error;
    std::filesystem::directory_iterator entry{folder, error};
    for (; !error && entry != std::filesystem::directory_iterator{}; entry.increment(error)) {
        names.push_back(entry->path().filename());
    }
    if (error && error != std::errc::no_such_file_or_directory) {
        throw failure{kCallFailed, "cannot read " + folder + ": " + error.message()};
    }
    return names;
}

} // namespace kova
