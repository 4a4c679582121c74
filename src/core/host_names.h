/**
 * @file
 * What names of hosts stand for: the resolver's answers, and those of the local network.
 */
#pragma once

#include "core/bounded_lines.h"
#include "core/guards.h"
#include "core/report.h"
#include "core/text.h"

#include <netdb.h>
#include <netinet/in.h>

namespace kova {

struct address_list_kind {
    static addrinfo *none() { return nullptr; }
    static void release(addrinfo *list) { freeaddrinfo(list); }
};
/** Answers of getaddrinfo. */
using address_list = owner<address_list_kind>;

/**
 * The hosts of the local network that answer to a NetBIOS name. Runs "/usr/bin/nmblookup", but not for names that no
 * host can have or that the tool would take for an option.
 */
class netbios_answers {
public:
    /** Logs at the place what keeps the network from being asked, and no host answers then. */
    netbios_answers(const place &at, const char *szName);
    /** @return whether another host answers, at this address */
    [[nodiscard]] bool next(in_addr &address);

private:
    built_text<70> pattern_;
    process_stream tool_;
    heap<char> line_;
    bounded_lines lines_;
};

} // namespace kova
