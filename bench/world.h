/**
 * @file
 * What the contests are held on: interfaces, files and programs of the box.
 */
#pragma once

#include "contest.h"

#include <box/system.h>
#include <spawn.h>
#include <string>
#include <vector>

namespace kova {

/** Fails when a side did not do its job. */
void require_done(bool done, const char *what);

/** Reads a file of any size to its end and throws away what it holds. */
void read_whole(const char *path);

/** A network with a number of interfaces in all, loopback and eth0 among them; those that it made go with it. */
class interfaces {
public:
    enum class state { down, addressed };
    interfaces(int count, state wanted);
    ~interfaces();
    interfaces(const interfaces &) = delete;
    interfaces &operator=(const interfaces &) = delete;
};

/** A directory on the disk of the build tree, removed with what is in it. */
class disk_directory {
public:
    disk_directory();
    ~disk_directory();
    disk_directory(const disk_directory &) = delete;
    disk_directory &operator=(const disk_directory &) = delete;

    [[nodiscard]] std::string file(const std::string &name) const { return path_ + "/" + name; }

private:
    std::string path_;
};

/** Where disk_directory makes its directories. */
void set_disk(const std::string &directory);

/** A program with its arguments, run for what it costs: its output goes to /dev/null. */
class silent_program {
public:
    explicit silent_program(std::vector<std::string> arguments);
    ~silent_program();
    silent_program(const silent_program &) = delete;
    silent_program &operator=(const silent_program &) = delete;

    /** Starts it and waits; fails unless it ends with status 0. */
    void run() const;

private:
    std::vector<std::string> arguments_;
    posix_spawn_file_actions_t actions_;
};

/** What a run of a program takes. */
measure time_of_run(std::vector<std::string> arguments);

} // namespace kova
