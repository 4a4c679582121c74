// The network namespaces of a box: its own, and the one named "net" that plays the network around it.
#ifndef KOVA_LAB_BOX_NETWORK_H
#define KOVA_LAB_BOX_NETWORK_H

#include "options.h"
#include "system.h"

namespace kova {

// Enters a new network namespace. Returns the other side's namespace, an empty owner when the box has no network.
unique_fd enter_network_namespace(const box_options &options);

// Brings up loopback and the links to the other side. Needs /proc and /run of the box.
void wire_network(const box_options &options, const unique_fd &other_side);

} // namespace kova

#endif
