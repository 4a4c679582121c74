/**
 * @file
 * The runs of system tools: no shell, quiet, waited for; the result is the program's exit status.
 */
#pragma once

#include <kova/core.h>

namespace kova {

/** Flags word of KLIBCExecl: wait for the program and drop its output. */
inline constexpr int kQuietly = 0xBB;

template<typename... Text> [[nodiscard]] int run(const char *program, Text... arguments) {
    return KLIBCExecl(program, kQuietly, arguments..., static_cast<const char *>(nullptr));
}

/**
 * Lets the network script stop or start interfaces as their files say. What it answers is not looked at: the files hold
 * what is wanted, now and at the next boot.
 */
void stop_interfaces(const char *const *names, int count);
void start_interfaces(const char *const *names, int count);

inline constexpr char kPppoeStop[] = "/usr/sbin/pppoe-stop";

/** Starts or stops the DHCP client of an interface; both return before the client has done its work. */
[[nodiscard]] int start_dhcp_client(const char *szIfname);
[[nodiscard]] int stop_dhcp_client(const char *szIfname);

} // namespace kova
