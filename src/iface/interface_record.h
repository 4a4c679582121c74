/**
 * @file
 * What the walks over all interfaces share: the cluster's word on an interface, and the record the kernel fills.
 */
#pragma once

#include "core/kernel.h"
#include "core/report.h"

#include <kovanetsdk/iface.h>
#include <kovanetsdk/stats.h>

namespace kova {

/** Interfaces that an enumeration looks at. */
inline constexpr int kMaxInterfaces = 32;

/** Bits of an interface kind beside its selector. */
inline constexpr int kKeepHeartbeat = 0x04;
inline constexpr int kClusterAddress = 0x10;

/** The kind without its bits. */
constexpr int selector_of(int kind) {
    return kind & ~(kKeepHeartbeat | kClusterAddress);
}

/** Whether cluster addresses are asked for and a cluster runs that gives them. */
bool wants_cluster_address(int kind);

/** Cluster address of an interface, in the sizes the cluster writes. */
struct cluster_address {
    char szIP[20];
    char szMask[20];
};

/** The cluster's part in an enumeration of a kind. */
class cluster_view {
public:
    /** Asks the cluster; logs at the place when it runs and cannot name its heartbeat interface. */
    cluster_view(const place &at, int kind);

    /** Whether cluster addresses stand in for the kernel's. */
    [[nodiscard]] bool gives_addresses() const { return is_running_ && (kind_ & kClusterAddress) != 0; }
    /** Whether an interface may be in the result; with a cluster address to show, its address is set. */
    [[nodiscard]] bool admits(const char *szIfname, cluster_address &address) const;
    /** Logs, after a walk, that the active node has no cluster address at all yet. */
    void note_result(const place &at, int count) const;

private:
    int kind_;
    bool is_running_;
    char heartbeat_[16] = ""; ///< "" without a cluster
};

/** Whether an interface may be in any result: up, without these flags, no member of a bridge or a switch bond. */
bool is_eligible(const char *szIfname, unsigned flags, unsigned excluded_flags);

/** Fills a record from the kernel, link from the running flag. @return 0; -1 with errno when a request failed */
int read_record(const interface_socket &socket, const char *szIfname, unsigned flags, IFINFO &record);

/** An interface of the virtual switch has the link of what is behind it. */
void correct_switch_link(IFINFO &record);

/** Takes over the cluster's address. */
void show_cluster_address(const cluster_address &address, IFINFO &record);

/**
 * Fills a card record: what the interface record says, and the configured address, in whose place the cluster's address
 * of the interface record is shown if asked for. @return 0, -1
 */
int fill_card(const IFINFO &record, bool shows_cluster_address, NETINFO *pNetInfo);

} // namespace kova
