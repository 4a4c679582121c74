/**
 * @file
 * The configuration that the client is started with.
 */
#pragma once

#include <string>

namespace kova {

/** The keys that this client looks at; the others are left to clients that know more kinds of tunnels. */
struct tunnel_settings {
    std::string server;         /**< "HOST" or "HOST:PORT" */
    std::string user;           /**< empty for an anonymous login */
    std::string password;       /**< of the user */
    std::string interface;      /**< name of the tunnel's interface */
    std::string broker_list;    /**< file for the brokers that another refers to */
    bool retries = false;       /**< tries again when a broker cannot be reached */
    int retry_delay = 1;        /**< seconds before the second try, twice as many before each one after it */
    int retry_delay_max = 1;    /**< but never more */
    int keepalive_interval = 0; /**< seconds between two signs of life, 0 for none */
};

/** Reads lines "key=value", where the value is everything behind "=". @return whether it can be read and names a server
 */
bool read_settings(const char *path, tunnel_settings &settings);

} // namespace kova
