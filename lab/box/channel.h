// What kova-box outside and the first process inside tell each other: one letter per message over a socket pair. Its
// end of file is the news that the other one is gone.
#ifndef KOVA_LAB_BOX_CHANNEL_H
#define KOVA_LAB_BOX_CHANNEL_H

namespace kova {

constexpr char kStopped = 's';            // inside -> outside: the command stopped, as after Ctrl-Z
constexpr char kContinue = 'c';           // outside -> inside: let it go on in the background
constexpr char kContinueForeground = 'f'; // outside -> inside: let it go on with the terminal

// Whose the terminal is while the command runs.
enum class terminal_use {
    none,       // not on a terminal: the command gets a session of its own
    background, // on a terminal that belongs to somebody else just now
    foreground, // the command gets the terminal
};

} // namespace kova

#endif
