// SPDX-License-Identifier: Apache-2.0
#include "platform/host/process.h"

#include <pthread.h>
#include <signal.h>
#include <sys/time.h>
#include <unistd.h>

#include <cstdlib>
#include <exception>
#include <mutex>
#include <new>

#include "platform/host/host_file.h"
#include "platform/host/log.h"

namespace host {

namespace {

constexpr suseconds_t kLastWordsMicroseconds = 250'000;

volatile sig_atomic_t endStatus = 0;

/// The signals that ask for a stop; one that is ignored, as below nohup, stays so.
sigset_t stopSignals() {
  sigset_t signals;
  sigemptyset(&signals);
  for (const int signal : {SIGTERM, SIGINT, SIGHUP}) {
    struct sigaction action = {};
    if (sigaction(signal, nullptr, &action) != 0 || action.sa_handler != SIG_IGN) sigaddset(&signals, signal);
  }
  return signals;
}

}  // namespace

void bringUp() {
  static std::once_flag once;
  std::call_once(once, [] {
    // Nobody may be left to read a line: neither the exit status nor a run is to suffer from it.
    signal(SIGPIPE, SIG_IGN);
    start([] { hostFile(); });
    // Until here a signal ends the process as it does any other; from here on something may be under way.
    const sigset_t signals = stopSignals();
    pthread_sigmask(SIG_BLOCK, &signals, nullptr);
    openLog();
  });
}

void start(const std::function<void()>& piece) {
  try {
    piece();
  } catch (const HostFileError& fault) {
    endProcess(kExitConfiguration, [&] { report(fault.what()); });
  } catch (const std::bad_alloc&) {
    endProcess(kExitRefused, [] { report("the system refuses memory"); });
  } catch (const std::exception& refusal) {
    endProcess(kExitRefused, [&] { report(refusal.what()); });
  }
}

int awaitStopSignal() {
  const sigset_t signals = stopSignals();
  int signal = 0;
  while (sigwait(&signals, &signal) != 0) {
  }
  return signal;
}

void endProcess(int status, const std::function<void()>& lastWords) {
  static std::mutex ending;
  ending.lock();
  endStatus = status;
  struct sigaction cut = {};
  cut.sa_handler = [](int) { _exit(endStatus); };
  sigaction(SIGALRM, &cut, nullptr);
  sigset_t alarm;
  sigemptyset(&alarm);
  sigaddset(&alarm, SIGALRM);
  pthread_sigmask(SIG_UNBLOCK, &alarm, nullptr);
  itimerval patience = {.it_interval = {}, .it_value = {.tv_sec = 0, .tv_usec = kLastWordsMicroseconds}};
  setitimer(ITIMER_REAL, &patience, nullptr);
  lastWords();
  patience = {};
  setitimer(ITIMER_REAL, &patience, nullptr);
  std::exit(status);
}

}  // namespace host
