/**
 * @file
 * Changes of the interfaces' links as the kernel tells them.
 */
#pragma once

#include <map>
#include <set>
#include <string>
#include <vector>

namespace kova {

/** What changed of an interface. */
struct link_change {
    enum kind { kAdded, kRemoved, kRenamed, kState } what;
    std::string name;
    std::string old_name; /**< kRenamed only */
    bool up;              /**< switched on */
    bool link;            /**< carrier */
    bool link_changed;    /**< the carrier came or went */
};

/** The kernel's interfaces from now on. */
class link_watcher {
public:
    /** Learns what there is. Ends the program when the kernel cannot be asked. */
    link_watcher();
    link_watcher(const link_watcher &) = delete;
    link_watcher &operator=(const link_watcher &) = delete;
    ~link_watcher();

    /** Waits for changes, for at most a time or until a signal. A change that is undone meanwhile may stay untold. */
    std::vector<link_change> wait(int milliseconds);

private:
    struct state {
        std::string name;
        bool up;
        bool link;
        bool operator==(const state &) const = default;
    };

    void ask();
    void end_answer(std::vector<link_change> &changes);
    bool receive(int flags, std::vector<link_change> &changes);
    void take(const void *message, size_t size, std::vector<link_change> &changes);
    void follow(int index, const state &now, std::vector<link_change> &changes);
    void forget(int index, std::vector<link_change> &changes);

    int fd_;
    std::map<int, state> known_; // by the kernel's number
    std::set<int> told_;         // since the kernel was asked
    bool is_asked_ = false;      // and the end of its answer has not come
    bool is_asked_again_ = false;
};

} // namespace kova
