#pragma once

namespace host {

/// Prepares the process as a daemon of this host, once, at its first word to the platform: takes SIGTERM and
/// SIGINT away from every thread but the main loop, connects the log and reads the host file. A wrong host
/// file ends the process with one line and exit status 78.
void bringUp();

}  // namespace host
