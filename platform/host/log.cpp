#include "platform/host/log.h"

#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>

#include "platform/host/bring_up.h"
#include "platform/system_log.h"

namespace host {

void openLog() {
  const bool echo = isatty(STDERR_FILENO) != 0 || access(_PATH_LOG, W_OK) != 0;
  openlog(program_invocation_short_name, LOG_PID | (echo ? LOG_PERROR : 0), LOG_DAEMON);
}

void note(const char* format, ...) {
  char text[256];
  va_list arguments;
  va_start(arguments, format);
  std::vsnprintf(text, sizeof text, format, arguments);
  va_end(arguments);
  syslog(LOG_NOTICE, "host: %s", text);
}

}  // namespace host

void SystemLog(const char* format, ...) {
  host::bringUp();
  va_list arguments;
  va_start(arguments, format);
  vsyslog(LOG_NOTICE, format, arguments);
  va_end(arguments);
}
