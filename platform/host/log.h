#pragma once

namespace host {

/// Connects to the system's log, and to standard error where that is a terminal or the log has no socket.
void openLog();

/// Writes a message of the host's own, in printf style, to where the process logs.
void note(const char* format, ...) __attribute__((format(printf, 1, 2)));

}  // namespace host
