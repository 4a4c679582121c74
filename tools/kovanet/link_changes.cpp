#include "link_changes.h"

#include "errors.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <linux/rtnetlink.h>
#include <net/if.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

namespace kova {
namespace {

constexpr size_t kMostBytes = 1 << 16;

[[noreturn]] void kernel_failed(const char *what) {
    throw failure{kCallFailed, textf("cannot %s the kernel's link changes: %s", what, strerror(errno))};
}

} // namespace

link_watcher::link_watcher() : fd_(socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_ROUTE)) {
    sockaddr_nl all_links{};
    all_links.nl_family = AF_NETLINK;
    all_links.nl_groups = RTMGRP_LINK;
    if (fd_ < 0 || bind(fd_, reinterpret_cast<const sockaddr *>(&all_links), sizeof all_links) != 0) {
        kernel_failed("listen to");
    }
    ask();
    std::vector<link_change> already_there;
    while (receive(0, already_there)) {
    }
}

link_watcher::~link_watcher() {
    close(fd_);
}

/** Has the kernel tell all interfaces; it gives one answer after the other. */
void link_watcher::ask() {
    if (is_asked_) {
        is_asked_again_ = true;
        return;
    }
    is_asked_ = true;
    told_.clear();
    struct {
        nlmsghdr header;
        ifinfomsg body;
    } request{};
    request.header.nlmsg_len = sizeof request;
    request.header.nlmsg_type = RTM_GETLINK;
    request.header.nlmsg_flags = NLM_F_REQUEST | NLM_F_DUMP;
    if (send(fd_, &request, sizeof request, 0) < 0) {
        kernel_failed("ask for");
    }
}

/** What is not in the answer is not there any more. */
void link_watcher::end_answer(std::vector<link_change> &changes) {
    is_asked_ = false;
    if (is_asked_again_) { // some of what was told meanwhile is lost
        is_asked_again_ = false;
        ask();
        return;
    }
    const std::map<int, state> before = known_;
    for (const auto &[index, now] : before) {
        if (!told_.contains(index)) {
            forget(index, changes);
        }
    }
}

/** Takes what one read gives. @return whether there may be more of an answer */
bool link_watcher::receive(int flags, std::vector<link_change> &changes) {
    alignas(nlmsghdr) char buffer[kMostBytes];
    const ssize_t size = recv(fd_, buffer, sizeof buffer, flags);
    if (size < 0) {
        if (errno == ENOBUFS) { // some were lost: what there is now tells what they were
            ask();
            return true;
        }
        if (errno != EAGAIN && errno != EINTR) {
            kernel_failed("read");
        }
        return false;
    }
    auto left = static_cast<size_t>(size);
    for (auto *header = reinterpret_cast<nlmsghdr *>(buffer); NLMSG_OK(header, left);
         header = NLMSG_NEXT(header, left)) {
        is_asked_again_ = is_asked_again_ || (header->nlmsg_flags & NLM_F_DUMP_INTR) != 0;
        if (header->nlmsg_type == NLMSG_DONE) {
            end_answer(changes);
        } else {
            take(header, header->nlmsg_len, changes);
        }
    }
    return is_asked_;
}

void link_watcher::take(const void *message, size_t size, std::vector<link_change> &changes) {
    const auto *const header = static_cast<const nlmsghdr *>(message);
    if (header->nlmsg_type == NLMSG_ERROR && size >= NLMSG_LENGTH(sizeof(nlmsgerr))) {
        errno = -static_cast<const nlmsgerr *>(NLMSG_DATA(header))->error;
        kernel_failed("ask for");
    }
    if ((header->nlmsg_type != RTM_NEWLINK && header->nlmsg_type != RTM_DELLINK) ||
        size < NLMSG_LENGTH(sizeof(ifinfomsg))) {
        return;
    }
    const auto *const body = static_cast<const ifinfomsg *>(NLMSG_DATA(header));
    if (body->ifi_family != AF_UNSPEC) { // bridges tell of their ports as well
        return;
    }
    if (header->nlmsg_type == RTM_DELLINK) {
        told_.erase(body->ifi_index);
        forget(body->ifi_index, changes);
        return;
    }
    told_.insert(body->ifi_index);
    auto left = IFLA_PAYLOAD(header);
    for (const auto *attribute = IFLA_RTA(body); RTA_OK(attribute, left); attribute = RTA_NEXT(attribute, left)) {
        if (attribute->rta_type == IFLA_IFNAME) {
            const auto *const name = static_cast<const char *>(RTA_DATA(attribute));
            follow(body->ifi_index,
                   {std::string(name, strnlen(name, RTA_PAYLOAD(attribute))), (body->ifi_flags & IFF_UP) != 0,
                    (body->ifi_flags & IFF_RUNNING) != 0},
                   changes);
        }
    }
}

void link_watcher::follow(int index, const state &now, std::vector<link_change> &changes) {
    const auto found = known_.find(index);
    if (found == known_.end()) {
        changes.push_back({link_change::kAdded, now.name, "", now.up, now.link, false});
    } else {
        const state &before = found->second;
        if (now.name != before.name) {
            changes.push_back({link_change::kRenamed, now.name, before.name, now.up, now.link, false});
        }
        if (now.up != before.up || now.link != before.link) {
            changes.push_back({link_change::kState, now.name, "", now.up, now.link, now.link != before.link});
        }
    }
    known_[index] = now;
}

void link_watcher::forget(int index, std::vector<link_change> &changes) {
    if (const auto found = known_.find(index); found != known_.end()) {
        changes.push_back({link_change::kRemoved, found->second.name, "", false, false, false});
        known_.erase(found);
    }
}

std::vector<link_change> link_watcher::wait(int milliseconds) {
    std::vector<link_change> changes;
    pollfd one{fd_, POLLIN, 0};
    if (poll(&one, 1, milliseconds) > 0) {
        receive(MSG_DONTWAIT, changes);
    }
    return changes;
}

} // namespace kova
