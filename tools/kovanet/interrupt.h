/**
 * @file
 * Commands that run until they are told to stop.
 */
#pragma once

namespace kova {

/** SIGINT and SIGTERM no longer end the program at once, but are noted, and end waits. */
void stop_on_signals();
/** Whether one of them has come. */
bool is_interrupted();

/** Sleeps for some seconds, or until told to stop. @return whether it may go on */
bool sleep_unless_interrupted(double seconds);

} // namespace kova
