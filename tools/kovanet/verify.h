/**
 * @file
 * What the parts of kovanet verify have in common: each compares some of the files with what there is.
 */
#pragma once

#include "interfaces.h"
#include "stored.h"

#include <string>
#include <vector>

namespace kova {

/** What files want and what there is, setting by setting. */
class comparison {
public:
    /** An empty value of either side is none. */
    void add(const std::string &file, const std::string &key, const std::string &wanted, const std::string &actual);
    [[nodiscard]] int settings() const { return settings_; }
    [[nodiscard]] const json &differences() const { return differences_; }

private:
    int settings_ = 0;
    json differences_ = json::array();
};

bool is_yes(const std::string &file, const std::string &key);
/** How a switch is compared, however its file spells it. */
inline const char *yes_or_no(bool is_on) {
    return is_on ? "yes" : "no";
}

/** The wanted text when it is among others, else those. */
template<typename IsSame>
std::string like(const std::string &wanted, const std::vector<std::string> &there, IsSame is_same) {
    std::string all;
    for (const std::string &one : there) {
        if (is_same(one, wanted)) {
            return wanted;
        }
        all += (all.empty() ? "" : " ") + one;
    }
    return all;
}

/** Whether a job runs, by the record that its start has left. @param job_and_keys  "JOB,KEY=VALUE", sorted keys */
bool job_runs(const std::string &job_and_keys);
/** The interface of the PPPoE connection, "" while there is none. */
std::string pppoe_interface();

/** The interfaces whose files bring them up at boot. */
void compare_interfaces(comparison &result);
/** IPv6 of one of them that has it of its own. */
void compare_ipv6(comparison &result, const std::string &file, const IFINFO &info);
/** Host name, default route, name servers and static routes. */
void compare_machine(comparison &result);
/** The DHCP and router-advertisement server. */
void compare_dhcp_server(comparison &result);
/** PPPoE, its relays, the IPv6 tunnel, and what else is switched on or off by a file. */
void compare_services(comparison &result);

} // namespace kova
