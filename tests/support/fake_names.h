/**
 * @file
 * Stands in for the resolver while one lives: getaddrinfo knows what it was told and nothing else.
 */
#pragma once

#include "support/rig.h"

struct addrinfo;

namespace kova_test {

class fake_names {
public:
    fake_names();
    fake_names(const fake_names &) = delete;
    fake_names &operator=(const fake_names &) = delete;
    ~fake_names();

    /** The addresses of a name in the order of the answers; a text that is none stands for one of another family. */
    void add(const std::string &name, const texts &addresses) { known_[name] = addresses; }

    texts asked; ///< in order: "nas01", with "/SERVICE" when one was given and " x3" when each address is wanted thrice

    // ---- used by the replaced calls

    int answer(const char *name, const char *service, const addrinfo *hints, addrinfo **list);
    static void free_list(addrinfo *list);

private:
    std::map<std::string, texts> known_;
};

} // namespace kova_test
