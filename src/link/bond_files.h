/**
 * @file
 * The interface files of a bond and its members, and the copies they are put back from.
 */
#pragma once

#include "core/ifcfg.h"

#include <kovanetsdk/link.h>

namespace kova {

/** The copy of a member's file that is made before the file changes. */
class saved_path : public path_text {
public:
    explicit saved_path(const char *szSlave) : path_text("/etc/sysconfig/network-scripts/ifcfg-%s.saved", szSlave) {}
};

/** Deletes what earlier changes left as copies: they are not what this one would put back. */
void drop_old_copies(const KOVALINKAGGROPT &bond);

/** Puts the files of all members back. */
void restore_slaves(const KOVALINKAGGROPT &bond);

/** The keys that make a file that of a bond's member. */
void set_member_keys(key_changes &changes, const char *szSlave, const char *szBond);

/** Whether the bond's name can be part of a path, and ends within its field. */
[[nodiscard]] bool has_usable_name(const KOVALINKAGGROPT &bond);

/** The same for its members; one without a name is passed over. */
[[nodiscard]] bool has_usable_slaves(const KOVALINKAGGROPT &bond);

} // namespace kova
