#include "support/fake_names.h"

#include "support/fault_points.h"

#include <arpa/inet.h>
#include <cstring>
#include <dlfcn.h>
#include <netdb.h>

namespace kova_test {

namespace {

fake_names *current_names = nullptr;

/** An answer together with its address. */
struct answer_of_name {
    addrinfo info;
    sockaddr_storage address;
};

addrinfo *make_answer(const std::string &text, int type, int port) {
    auto *const made = new answer_of_name{};
    auto *const v4 = reinterpret_cast<sockaddr_in *>(&made->address);
    auto *const v6 = reinterpret_cast<sockaddr_in6 *>(&made->address);
    made->info.ai_family = inet_pton(AF_INET, text.c_str(), &v4->sin_addr) == 1     ? AF_INET
                           : inet_pton(AF_INET6, text.c_str(), &v6->sin6_addr) == 1 ? AF_INET6
                                                                                    : AF_APPLETALK;
    v4->sin_port = htons(static_cast<uint16_t>(port)); // at the same place in both
    made->address.ss_family = static_cast<sa_family_t>(made->info.ai_family);
    made->info.ai_socktype = type;
    made->info.ai_addr = reinterpret_cast<sockaddr *>(&made->address);
    made->info.ai_addrlen = made->info.ai_family == AF_INET6 ? sizeof *v6 : sizeof *v4;
    return &made->info;
}

} // namespace

fake_names::fake_names() {
    current_names = this;
}

fake_names::~fake_names() {
    current_names = nullptr;
}

int fake_names::answer(const char *name, const char *service, const addrinfo *hints, addrinfo **list) {
    const rig_at_work guard;
    // the resolver gives every address once for each kind of socket that is not ruled out
    const int wanted = hints != nullptr ? hints->ai_socktype : 0;
    asked.push_back(name + (service != nullptr ? std::string("/") + service : "") + (wanted == 0 ? " x3" : ""));
    const auto found = known_.find(name);
    if (found == known_.end()) {
        return EAI_NONAME;
    }
    addrinfo **end = list;
    for (const std::string &text : found->second) {
        for (const int type : {SOCK_STREAM, SOCK_DGRAM, SOCK_RAW}) {
            if (wanted == 0 || wanted == type) {
                *end = make_answer(text, type, service != nullptr ? atoi(service) : 0);
                end = &(*end)->ai_next;
            }
        }
    }
    current_rig->held["address lists"] += 1;
    return 0;
}

void fake_names::free_list(addrinfo *list) {
    const rig_at_work guard;
    current_rig->held["address lists"] -= 1;
    while (list != nullptr) {
        auto *const made = reinterpret_cast<answer_of_name *>(list);
        list = list->ai_next;
        delete made;
    }
}

} // namespace kova_test

using namespace kova_test;

extern "C" int getaddrinfo(const char *name, const char *service, const addrinfo *hints, addrinfo **list) {
    static const auto next = reinterpret_cast<decltype(&getaddrinfo)>(dlsym(RTLD_NEXT, "getaddrinfo"));
    const fault_point point{"getaddrinfo", is_in_code_under_test(__builtin_return_address(0)),
                            [&] { return std::string(name); }};
    if (point.fails() || (current_rig != nullptr && current_rig->is_failing("getaddrinfo"))) {
        return EAI_MEMORY;
    }
    return current_names != nullptr ? current_names->answer(name, service, hints, list)
                                    : next(name, service, hints, list);
}

extern "C" void freeaddrinfo(addrinfo *list) noexcept {
    static const auto next = reinterpret_cast<decltype(&freeaddrinfo)>(dlsym(RTLD_NEXT, "freeaddrinfo"));
    return current_names != nullptr ? fake_names::free_list(list) : next(list);
}

static const bool is_known = can_fail("getaddrinfo");
