/**
 * @file
 * Everything that writes files, one line each: what the sweep kills and what it may find then.
 */
#pragma once

#include <functional>
#include <string>
#include <vector>

namespace kova_test {

/** Which files an operation changes. */
enum class works_on { kAnyFile, kPresentFile, kMissingFile, kNoFile };

struct operation {
    std::string name;
    /** Places to kill at there are at least: two for each system call of the shortest way through. */
    int floor;
    /** Does it to a file. @return whether the result is the one expected */
    std::function<bool(const char *path)> call;

    works_on files = works_on::kAnyFile;
    std::string path{};                ///< the only file it works on; empty: any
    std::string text{kKeys};           ///< what the file holds before
    unsigned mode = 0644;              ///< of a file it makes
    bool is_built_of_others = false;   ///< which are tried in all surroundings; this one in the plain ones
    bool puts_back = false;            ///< fails, and a file that was there is as before
    bool keeps_backup = false;         ///< a killed one may leave "<file>.tmp<seconds>", which every reader skips
    bool is_random = false;            ///< two files it makes differ, their sizes do not
    bool makes_anew = false;           ///< a file that was there is replaced by one that has nothing from it
    std::vector<std::string> others{}; ///< names of files beside it that it works on, too
    /** Names of its temporaries without the six letters and digits that make them unique: a killed one may leave each.
     */
    std::vector<std::string> temporaries{};
    /** Each writes a bit more of what a file may hold in between, when that is more than old and new. */
    std::vector<std::function<bool(const char *path)>> parts{};

    static constexpr char kKeys[] =
        "# kept as it is\nDEVICE=eth0\nKEY=old\nONBOOT=no\nBOOTPROTO=dhcp\nIPADDR=10.0.0.1\n"
        "NETMASK=255.0.0.0\nMASTER=bond0\nMARKER\nLAST=\"1\"\n";
};

const std::vector<operation> &operations();

} // namespace kova_test
