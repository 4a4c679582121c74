/**
 * @file
 * What creating and removing a VLAN have in common: the configuration of one interface moves to another.
 */
#pragma once

#include "core/ifcfg.h"
#include "core/replacement_file.h"
#include "core/report.h"

namespace kova {

/** Links need a while to come back. */
inline constexpr int kVlanSettleSeconds = 2;

/** An interface file that is written anew. */
class new_ifcfg {
public:
    /** @param path_template  where it is written, beside the file it replaces */
    new_ifcfg(const char *szIfname, const char *path_template);
    [[nodiscard]] bool is_open() const { return file_.is_open(); }

    [[nodiscard]] FILE *get() const { return file_.get(); }
    /** Takes over the lines of another file that begin with one of the beginnings, or those that begin with none. */
    [[nodiscard]] int copy_lines(const place &at, const char *path, std::initializer_list<const char *> beginnings,
                                 bool is_beginning_wanted);
    /** Everything is written. @return 0; -1 with NET_ERR_FILE_WRITE */
    [[nodiscard]] int finish(const place &at) const;
    /** Takes the place of the interface's file, readable by all. @return 0; -1 */
    [[nodiscard]] int replace(const place &at);

private:
    ifcfg_path target_;
    replacement_file file_;
};

/** Tells firewall, traffic control and DHCP server the interface's new name, and restarts the latter. @return 0; -1 */
[[nodiscard]] int tell_new_name(const place &at, const char *szOld, const char *szNew);

/** Stops PPPoE on an interface that is about to change. @return 0; -1, logged */
[[nodiscard]] int disable_pppoe(const place &at, const char *szIfname);

} // namespace kova
