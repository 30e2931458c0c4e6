// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <span>

namespace host {

/// Replaces each byte of a text that is no part of a printable UTF-8 character by '?': names from outside
/// must not steer a terminal.
void makePrintable(std::span<char> text);

/// Connects to the system's log, and to standard error where that is a terminal or the log has no socket.
void openLog();

/// Writes a message of the host's own, in printf style, to where the process logs.
void note(const char* format, ...) __attribute__((format(printf, 1, 2)));

/// Writes to standard error the one line of a start that ends with it.
void report(const char* line);

}  // namespace host
