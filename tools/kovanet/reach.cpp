// kovanet reach: whether a host answers on a TCP port.
#include "errors.h"
#include "objects.h"
#include "table.h"
#include "words.h"

#include <chrono>
#include <cstdio>
#include <kovanetsdk/stats.h>

namespace kova {
namespace {

struct reach_words {
    std::string host;
    std::string port;
    std::string keyword;
    std::string timeout = "5";
};

/** Seconds that a call of the library takes, to the millisecond. */
double seconds_since(std::chrono::steady_clock::time_point start) {
    using std::chrono::milliseconds;
    constexpr double kPerSecond = 1000;
    const auto passed = std::chrono::steady_clock::now() - start;
    return static_cast<double>(std::chrono::duration_cast<milliseconds>(passed).count()) / kPerSecond;
}

void tell(const reach_words &words, bool as_json) {
    constexpr int kHighestPort = 65535;
    constexpr int kLongest = 3600;
    const auto port = static_cast<int>(number_within("port", words.port, 1, kHighestPort));
    const auto timeout = static_cast<int>(number_within("timeout", words.timeout, 1, kLongest));
    if (words.host.empty()) {
        throw failure{kNo, "host \"\" is not valid: it is a name or an address"};
    }
    json record = {{"host", words.host}, {"port", port}, {"timeout_seconds", timeout}};
    const std::string what = words.host + " port " + std::to_string(port);
    const auto start = std::chrono::steady_clock::now();
    {
        const step_note note{"waiting for " + printable(what)};
        record["reachable"] = BlKLIBIsConnected(words.host.c_str(), port, timeout) == 1;
    }
    record["seconds"] = seconds_since(start);
    const bool is_reachable = record["reachable"] == true;
    if (as_json) {
        print_json(record);
    } else {
        printf("%s %s, after %.1f s\n", printable(what).c_str(), is_reachable ? "answers" : "does not answer",
               record["seconds"].get<double>());
    }
    if (!is_reachable) {
        throw failure{kNo, ""}; // the answer is the output
    }
}

} // namespace

void add_reach(CLI::App &object, const global_options &options) {
    auto &words = words_of<reach_words>();
    object.add_option("HOST", words.host, "name or address")->required();
    object.add_option("PORT", words.port, "TCP port, 1 to 65535")->required();
    add_keyword(object, "timeout", words.keyword, "SECONDS", words.timeout,
                "how long each address of the host is waited for (5)");
    object.callback([&words, &options] { tell(words, options.json); });
}

} // namespace kova
