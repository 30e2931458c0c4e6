#include <pthread.h>
#include <signal.h>

#include <chrono>
#include <condition_variable>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <string>
#include <thread>

#include "platform/background_activity.h"
#include "platform/host/bring_up.h"
#include "platform/host/conditions.h"
#include "platform/host/host_file.h"
#include "platform/host/log.h"
#include "platform/main_loop.h"

using std::chrono::seconds;
using std::chrono::steady_clock;

/// The process's one activity: calls its handler, answers its questions, and ends the process.
///
/// The handler is called on the thread that `serve` runs on; stops are asked for by the main loop's thread.
struct Activity {
  Activity(const host::HostFile& file, ActivityHandler handler) : file_(file), handler_(handler) {}

  /// Checks in and runs the activity when it is due, until there is no further run or a stop was asked for.
  [[noreturn]] void serve() {
    call(ActivityStateCheckIn);
    seconds pause(file_.activity.startAfterSeconds);
    while (waitUnlessStopped(pause)) {
      host::note("running activity %s", file_.activity.identifier.c_str());
      if (call(ActivityStateRun) == ActivityStateDefer) {
        pause = seconds(file_.activity.retrySeconds);
      } else if (file_.activity.intervalSeconds != 0) {
        pause = seconds(file_.activity.intervalSeconds);
      } else {
        host::note("the activity has finished, ending the process");
        std::exit(EXIT_SUCCESS);
      }
    }
    endStopped();
  }

  void stop(int signal) {
    host::note("SIG%s: asking the activity to yield, then ending the process", sigabbrev_np(signal));
    {
      const std::lock_guard lock(mutex_);
      stopped_ = true;
    }
    wake_.notify_all();
  }

  /// The handler's word that nothing is outstanding: where a stop was asked for, the process may go.
  void declareClean() {
    bool stopped = false;
    {
      const std::lock_guard lock(mutex_);
      stopped = stopped_;
    }
    if (stopped) endStopped();
  }

  int state() {
    const std::lock_guard lock(mutex_);
    return state_;
  }

  bool setState(int state) {
    const std::lock_guard lock(mutex_);
    if (state_ != ActivityStateRun || state != ActivityStateDefer) return false;
    state_ = state;
    return true;
  }

  bool shouldDefer() {
    std::string reason;
    {
      const std::lock_guard lock(mutex_);
      ++questions_;
      reason = reasonToYield();
      if (reason == lastReason_) return !reason.empty();
      lastReason_ = reason;
    }
    host::note("%s", reason.empty() ? "no longer asking to yield" : ("asking to yield: " + reason).c_str());
    return !reason.empty();
  }

 private:
  /// Calls the handler and returns the state in which it left the activity.
  int call(int state) {
    {
      const std::lock_guard lock(mutex_);
      state_ = state;
      questions_ = 0;
      lastReason_.clear();
      runStart_ = steady_clock::now();
    }
    handler_(this);
    return this->state();
  }

  /// Returns false at once when a stop was or is asked for, true when the time has passed.
  bool waitUnlessStopped(seconds pause) {
    if (pause != seconds::zero()) host::note("next run in %lld s", static_cast<long long>(pause.count()));
    std::unique_lock lock(mutex_);
    return !wake_.wait_for(lock, pause, [this] { return stopped_; });
  }

  [[noreturn]] static void endStopped() {
    host::note("stopped, ending the process");
    std::exit(EXIT_SUCCESS);
  }

  std::string reasonToYield() const {
    const host::YieldSettings& yield = file_.yield;
    if (stopped_) return "the process is being stopped";
    if (yield.atCheck && questions_ >= *yield.atCheck) return "check " + std::to_string(*yield.atCheck);
    if (yield.afterSeconds && steady_clock::now() - runStart_ >= seconds(*yield.afterSeconds)) {
      return "the run has lasted " + std::to_string(*yield.afterSeconds) + " s";
    }
    if (yield.onBattery && host::runsOnBattery("/sys/class/power_supply")) return "on battery";
    if (yield.ioPressurePercent) {
      const auto pressure = host::ioPressurePercent("/proc/pressure/io");
      if (pressure && *pressure > *yield.ioPressurePercent) {
        return "I/O pressure above " + std::to_string(*yield.ioPressurePercent) + " %";
      }
    }
    return "";
  }

  const host::HostFile& file_;
  const ActivityHandler handler_;

  std::mutex mutex_;
  std::condition_variable wake_;
  bool stopped_ = false;
  int state_ = ActivityStateCheckIn;
  uint32_t questions_ = 0;
  std::string lastReason_;
  steady_clock::time_point runStart_;
};

struct ActivityCriteria {};

namespace {

constexpr ActivityCriteria kCheckIn;

/// Lives as long as the process: its threads may use it until the very end.
Activity* registered = nullptr;

sigset_t stopSignals() {
  sigset_t signals;
  sigemptyset(&signals);
  sigaddset(&signals, SIGTERM);
  sigaddset(&signals, SIGINT);
  sigaddset(&signals, SIGHUP);
  return signals;
}

[[noreturn]] void endStart(const host::HostFileError& fault) {
  host::report(fault);
  std::exit(host::kExitConfiguration);
}

}  // namespace

const ActivityCriteria* const ActivityCheckIn = &kCheckIn;

namespace host {

void bringUp() {
  static std::once_flag once;
  std::call_once(once, [] {
    try {
      hostFile();
    } catch (const HostFileError& fault) {
      endStart(fault);
    }
    // Until here a signal ends the process as it does any other; from here on something may be under way.
    const sigset_t signals = stopSignals();
    pthread_sigmask(SIG_BLOCK, &signals, nullptr);
    // A run is not to end because nobody reads its lines any more.
    signal(SIGPIPE, SIG_IGN);
    openLog();
  });
}

}  // namespace host

void RegisterActivity(const char* identifier, const ActivityCriteria*, ActivityHandler handler) {
  host::bringUp();
  const host::HostFile& file = host::hostFile();
  const host::ActivitySettings& declared = file.activity;
  if (!file.name.empty() && declared.identifier != identifier) {
    endStart(
        {file.name, declared.identifierLine,
         "the host declares activity '" + declared.identifier + "', but none named '" + identifier + "'"});
  }
  if (registered != nullptr) {
    host::note("activity %s has its handler already", identifier);
    return;
  }
  registered = new Activity(file, handler);
  std::thread(&Activity::serve, registered).detach();
}

int GetActivityState(Activity* activity) {
  return activity->state();
}

bool ActivityShouldDefer(Activity* activity) {
  return activity->shouldDefer();
}

bool SetActivityState(Activity* activity, int state) {
  return activity->setState(state);
}

void ExitTransactionClean() {
  if (registered != nullptr) registered->declareClean();
}

void RunMainLoop() {
  host::bringUp();
  const sigset_t signals = stopSignals();
  for (int signal = 0; sigwait(&signals, &signal) == 0;) {
    if (registered == nullptr) std::exit(EXIT_SUCCESS);
    registered->stop(signal);
  }
  std::abort();
}
