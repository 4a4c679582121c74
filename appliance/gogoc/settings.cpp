#include "settings.h"

#include <algorithm>
#include <cstdlib>
#include <fstream>
#include <map>

namespace kova {
namespace {

/** A number of seconds, one at least. */
int seconds_of(const std::string &text) {
    constexpr long kMost = 3600;
    return static_cast<int>(std::clamp(strtol(text.c_str(), nullptr, 10), 1L, kMost));
}

} // namespace

bool read_settings(const char *path, tunnel_settings &settings) {
    std::map<std::string, std::string> values;
    std::ifstream file(path);
    for (std::string line; std::getline(file, line);) {
        const size_t end_of_key = line.find('=');
        if (end_of_key != std::string::npos) {
            values[line.substr(0, end_of_key)] = line.substr(end_of_key + 1);
        }
    }
    settings.server = values["server"];
    if (values["auth_method"] != "anonymous") {
        settings.user = values["userid"];
        settings.password = values["passwd"];
    }
    settings.interface = values["if_tunnel_v6udpv4"].empty() ? "tun" : values["if_tunnel_v6udpv4"];
    settings.broker_list = values["broker_list"];
    settings.retries = values["auto_retry_connect"] == "yes";
    settings.retry_delay = seconds_of(values["retry_delay"]);
    settings.retry_delay_max = std::max(settings.retry_delay, seconds_of(values["retry_delay_max"]));
    settings.keepalive_interval = values["keepalive"] == "yes" ? seconds_of(values["keepalive_interval"]) : 0;
    return file.eof() && !settings.server.empty();
}

} // namespace kova
