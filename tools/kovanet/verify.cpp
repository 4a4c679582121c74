// kovanet verify: whether the kernel's network and the services are what the configuration files say.
#include "verify.h"

#include "errors.h"
#include "interfaces.h"
#include "objects.h"

#include <cstdio>
#include <fstream>
#include <kova/core.h>
#include <sstream>

namespace kova {
namespace {

std::string or_nothing(const std::string &text) {
    return text.empty() ? "none" : text;
}

/** When a process was started, "" without it: tells it from another one that was given its number later. */
std::string start_of_process(const std::string &pid) {
    constexpr int kFieldsBetween = 19;
    std::ifstream file{"/proc/" + pid + "/stat"};
    std::string line;
    std::getline(file, line);
    const size_t name_end = line.rfind(')'); // the name may hold anything
    std::istringstream fields{name_end == std::string::npos ? "" : line.substr(name_end + 1)};
    std::string start;
    for (int i = 0; i <= kFieldsBetween; ++i) {
        fields >> start;
    }
    return fields ? start : "";
}

constexpr column kColumns[] = {
    {"FILE", [](const json &row) { return field(row, "file"); }},
    {"KEY", [](const json &row) { return field(row, "key"); }},
    {"WANTED", [](const json &row) { return field(row, "wanted"); }},
    {"ACTUAL", [](const json &row) { return field(row, "actual"); }},
};

comparison compare_all() {
    const config_lock lock{config_lock::kShared}; // no change is half done meanwhile
    comparison result;
    compare_interfaces(result);
    compare_machine(result);
    compare_dhcp_server(result);
    compare_services(result);
    return result;
}

void verify(bool as_json) {
    const comparison result = compare_all();
    const json &differences = result.differences();
    if (as_json) {
        print_json({{"agree", differences.empty()}, {"settings", result.settings()}, {"differences", differences}});
    } else if (differences.empty()) {
        printf("the kernel agrees with the files in all %d settings\n", result.settings());
    } else {
        print_table(differences, kColumns);
    }
    if (!differences.empty()) {
        throw failure{kNo, ""}; // the answer is the output
    }
}

} // namespace

void comparison::add(const std::string &file, const std::string &key, const std::string &wanted,
                     const std::string &actual) {
    ++settings_;
    if (wanted != actual) {
        differences_.push_back(
            {{"file", file}, {"key", key}, {"wanted", or_nothing(wanted)}, {"actual", or_nothing(actual)}});
    }
}

bool is_yes(const std::string &file, const std::string &key) {
    return stored_value(file, key) == "yes";
}

bool job_runs(const std::string &job_and_keys) {
    std::ifstream record{"/run/kova/jobs/" + job_and_keys};
    std::string pid, start;
    return record >> pid >> start && KLIBCIsProcAlive(pid.c_str()) == 1 && start_of_process(pid) == start;
}

void add_verify(CLI::App &object, const global_options &options) {
    object.callback([&options] { verify(options.json); });
}

} // namespace kova
