#pragma once

namespace host {

/// Prepares the process as a daemon of this host, once, at its first word to the platform: reads the host
/// file, takes SIGTERM, SIGINT and SIGHUP away from every thread but the main loop's, and connects the log. A
/// wrong host file ends the process with one line and exit status 78.
void bringUp();

}  // namespace host
