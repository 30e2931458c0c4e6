// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>

namespace host {

/// What the system refused: a thread, memory.
inline constexpr int kExitRefused = 71;
/// A wrong host file.
inline constexpr int kExitConfiguration = 78;

/// Prepares the process as a daemon of this host, once, at its first word to the platform: reads the host
/// file, takes SIGTERM, SIGINT and SIGHUP, unless they are ignored, away from every thread but the main
/// loop's, and connects the log.
void bringUp();

/// Takes a piece of the start. A wrong host file ends the process with one line and status 78, what the
/// system refuses with one line and status 71.
void start(const std::function<void()>& piece);

/// Waits for a signal that asks for a stop, and returns its number.
int awaitStopSignal();

/// Ends the process after its last words. Whatever stalls them, a log that nobody reads, delays the end by a
/// quarter of a second at most. Any thread may call; the first one ends the process, all others wait for the
/// end.
[[noreturn]] void endProcess(int status, const std::function<void()>& lastWords);

}  // namespace host
