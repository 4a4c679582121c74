/**
 * @file
 * What the units of the tunnel client share: names, and the check of an account that goes into lines of files.
 */
#pragma once

#include "core/report.h"
#include "core/text.h"

#include <kovanetsdk/tunnel.h>

namespace kova {

/** The tunnel's interface, and the name of its file. */
inline constexpr char kTunnelInterface[] = "tun";

/** Server and user; the password is each caller's own matter. */
[[nodiscard]] inline bool refuses_account(const place &at, const TUNNEL_CONF &conf) {
    return refuses(at, is_one_line(conf.szServer), "is_one_line(pConf->szServer)") ||
           refuses(at, is_one_line(conf.szUserId), "is_one_line(pConf->szUserId)");
}

/** The password of an account with a user. */
[[nodiscard]] inline bool refuses_password(const place &at, const TUNNEL_CONF &conf) {
    return conf.blAnonymous == 0 && refuses(at, is_one_line(conf.szPassword), "is_one_line(pConf->szPassword)");
}

/** What the client is told: an anonymous one names nobody. */
[[nodiscard]] inline bool refuses_login(const place &at, const TUNNEL_CONF &conf) {
    const bool is_anonymous = conf.blAnonymous != 0;
    return is_anonymous ? refuses(at, is_one_line(conf.szServer), "is_one_line(pConf->szServer)")
                        : refuses_account(at, conf) || refuses_password(at, conf);
}

} // namespace kova
