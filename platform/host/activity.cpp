// SPDX-License-Identifier: Apache-2.0
#include "platform/host/activity.h"

#include <signal.h>
#include <systemd/sd-daemon.h>
#include <time.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <new>
#include <string>
#include <system_error>
#include <thread>
#include <utility>

#include "platform/background_activity.h"
#include "platform/host/conditions.h"
#include "platform/host/host_file.h"
#include "platform/host/log.h"
#include "platform/host/metrics.h"
#include "platform/host/policy.h"
#include "platform/host/process.h"
#include "platform/host/schedule.h"
#include "platform/main_loop.h"

using host::Reason;
using host::Turn;
using std::chrono::nanoseconds;
using std::chrono::seconds;

namespace {

constexpr char kSupplies[] = "/sys/class/power_supply";
constexpr char kIoPressure[] = "/proc/pressure/io";

/// Time since the machine's start, its sleep included.
nanoseconds now() {
  timespec time = {};
  clock_gettime(CLOCK_BOOTTIME, &time);
  return seconds(time.tv_sec) + nanoseconds(time.tv_nsec);
}

void sleepUntil(nanoseconds end) {
  const auto whole = std::chrono::floor<seconds>(end);
  const timespec time = {.tv_sec = static_cast<time_t>(whole.count()),
                         .tv_nsec = static_cast<long>((end - whole).count())};
  int error = 0;
  do {
    error = clock_nanosleep(CLOCK_BOOTTIME, TIMER_ABSTIME, &time, nullptr);
  } while (error == EINTR);
  // A sandbox may lack this clock for waiting; then the machine's sleep makes the wait longer.
  if (error != 0) std::this_thread::sleep_for(end - now());
}

}  // namespace

/// The process's one activity: takes its turns, calls its handler and answers its questions.
///
/// Everything but the stop and what it must wait for belongs to the thread that `serve` runs on, which is the
/// handler's. Nothing on that thread waits for the main loop's: a stop that comes while no run is outstanding
/// ends the process there.
struct Activity {
  Activity(const host::HostFile& file, std::string identifier, ActivityHandler handler)
      : file_(file), identifier_(std::move(identifier)), handler_(handler) {
    for (size_t i = 0; i < reasons_.size(); ++i) reasons_[i] = describe(static_cast<Reason>(i), file.yield);
  }

  /// Tells what the host has, and which of its conditions cannot be told here.
  void announce() {
    if (file_.name.empty()) {
      host::note("no host file: running with the defaults, without a controller");
    } else {
      host::note("host file %s", file_.name.c_str());
    }
    for (const auto& controller : file_.controllers) host::note("emulating %s", controller.className.c_str());
    machineFigures();
  }

  /// Checks in and takes the activity's turns until there is no further one.
  [[noreturn]] void serve() {
    serving = this;
    writeMetrics();
    call(ActivityStateCheckIn);
    sd_notify(0, "READY=1");
    for (std::optional<seconds> pause = pauseAtStart(file_.activity); pause;
         pause = pauseAfter(takeTurn(), file_.activity)) {
      wait(*pause);
    }
    host::endProcess(EXIT_SUCCESS, [] { host::note("the activity has finished, ending the process"); });
  }

  /// Called by the main loop's thread. The stop counts before a word is said of it: the log may stall.
  void stop(int signal) {
    bool outstanding = false;
    {
      const std::lock_guard lock(mutex_);
      if (stopped_) return;
      stopped_ = true;
      outstanding = outstanding_;
    }
    if (!outstanding) {
      host::endProcess(EXIT_SUCCESS, [signal] {
        sd_notify(0, "STOPPING=1\nSTATUS=stopping");
        host::note("SIG%s: ending the process", sigabbrev_np(signal));
      });
    }
    sd_notify(0, "STOPPING=1\nSTATUS=stopping, the run is asked to yield");
    host::note("SIG%s: asking the activity to yield, then ending the process", sigabbrev_np(signal));
  }

  int state() const { return state_; }

  bool setState(int state) {
    if (state_ != ActivityStateRun || state != ActivityStateDefer) return false;
    state_ = state;
    return true;
  }

  /// Once the answer is yes, it is so until the run ends: what has been put off is not to look finished
  /// because a condition has passed.
  bool shouldDefer() {
    if (yieldsFor_ != Reason::kNone) return true;
    yieldsFor_ = reasonOfRun(file_.yield, {isStopped(), ++questions_, now() - runStart_});
    if (yieldsFor_ == Reason::kNone) yieldsFor_ = reasonOfMachine(file_.yield, machineFigures());
    if (yieldsFor_ == Reason::kNone) return false;
    host::note("asking to yield: %s", inWords(yieldsFor_));
    sd_notifyf(0, "STATUS=asked to yield: %s", inWords(yieldsFor_));
    return true;
  }

  /// The handler's word that nothing is outstanding: the run has ended, and where a stop was asked for, the
  /// process goes.
  void declareClean() {
    if (!running_) return;
    running_ = false;
    runTime_ += now() - runStart_;
    if (state_ == ActivityStateDefer) {
      countDeferral(yieldsFor_);
    } else {
      metrics_.lastFinish = time(nullptr);
    }
    bool stopped = false;
    {
      const std::lock_guard lock(mutex_);
      outstanding_ = false;
      stopped = stopped_;
    }
    if (stopped) {
      host::endProcess(EXIT_SUCCESS, [this] {
        writeMetrics();
        host::note("stopped, ending the process");
      });
    }
    writeMetrics();
  }

  void stepBegins() {
    if (running_) sd_notifyf(0, "STATUS=running, step %u", ++steps_);
  }

  void stepEnded(int32_t result, std::optional<uint32_t> reply) {
    if (!running_) return;
    ++(result == 0 ? metrics_.stepsPassed : metrics_.stepsFailed);
    if (reply) metrics_.workPending = *reply != 0;
    writeMetrics();
  }

  /// The activity whose handler's thread this is.
  static thread_local Activity* serving;

 private:
  /// Runs the activity, unless the machine holds it back.
  Turn takeTurn() {
    const Reason reason = reasonOfMachine(file_.yield, machineFigures());
    if (reason != Reason::kNone) {
      holdBack(reason);
      return Turn::kHeldBack;
    }
    heldFor_ = Reason::kNone;
    beginRun();
    return call(ActivityStateRun) == ActivityStateDefer ? Turn::kDeferred : Turn::kFinished;
  }

  /// Says once why no run begins, however often the question is asked again.
  void holdBack(Reason reason) {
    if (reason == heldFor_) return;
    heldFor_ = reason;
    host::note("no run begins: %s; asking again every %u s", inWords(reason), file_.activity.retrySeconds);
    countDeferral(reason);
    writeMetrics();
  }

  void beginRun() {
    bool stopped = false;
    {
      const std::lock_guard lock(mutex_);
      stopped = stopped_;
      outstanding_ = true;
    }
    // The main loop's thread ends the process, or has: with a run that had begun it would wait for it.
    if (stopped) host::endProcess(EXIT_SUCCESS, [] {});
    running_ = true;
    questions_ = 0;
    steps_ = 0;
    yieldsFor_ = Reason::kNone;
    runStart_ = now();
    ++metrics_.runs;
    host::note("running activity %s", identifier_.c_str());
    sd_notify(0, "STATUS=running");
  }

  /// Calls the handler and returns the state in which it left the activity.
  int call(int state) {
    state_ = state;
    handler_(this);
    return state_;
  }

  void wait(seconds pause) {
    const nanoseconds end = now() + pause;
    const time_t clock = time(nullptr) + static_cast<time_t>(pause.count());
    tm local = {};
    std::array<char, 64> until = {};
    std::strftime(until.data(), until.size(), "%F %T %Z", localtime_r(&clock, &local));
    if (heldFor_ != Reason::kNone) {
      sd_notifyf(0, "STATUS=idle, %s; asking again at %s", inWords(heldFor_), until.data());
    } else if (pause != seconds::zero()) {
      host::note("next run in %lld s", static_cast<long long>(pause.count()));
      sd_notifyf(0, "STATUS=idle until %s", until.data());
    }
    sleepUntil(end);
  }

  bool isStopped() {
    const std::lock_guard lock(mutex_);
    return stopped_;
  }

  const char* inWords(Reason reason) const { return reasons_[static_cast<size_t>(reason)].c_str(); }

  void countDeferral(Reason reason) { ++metrics_.deferrals[static_cast<size_t>(reason)]; }

  /// Asks the machine for what the host file wants to know. What it cannot tell is said once.
  host::MachineFigures machineFigures() {
    host::MachineFigures figures;
    if (file_.yield.onBattery) {
      figures.onBattery = host::runsOnBattery(kSupplies);
      if (!figures.onBattery) sayOnce(saidSupplies_, "on_battery", kSupplies);
    }
    if (file_.yield.ioPressurePercent) {
      figures.ioPressurePercent = host::ioPressurePercent(kIoPressure);
      if (!figures.ioPressurePercent) sayOnce(saidPressure_, "io_pressure_percent", kIoPressure);
    }
    return figures;
  }

  static void sayOnce(bool& said, const char* condition, const char* path) {
    if (!said) host::note("%s never holds: %s tells nothing here", condition, path);
    said = true;
  }

  void writeMetrics() {
    if (file_.metricsFile.empty()) return;
    metrics_.runTime = std::chrono::duration_cast<std::chrono::milliseconds>(
        runTime_ + (running_ ? now() - runStart_ : nanoseconds::zero()));
    int error = ENOMEM;
    try {
      error = host::replaceFile(file_.metricsFile, exposition(metrics_));
    } catch (const std::bad_alloc&) {
    }
    if (error != 0 && !saidMetrics_) {
      host::note("no metrics: %s: %s", file_.metricsFile.c_str(), strerrordesc_np(error));
    }
    saidMetrics_ = error != 0;
  }

  const host::HostFile& file_;
  const std::string identifier_;
  const ActivityHandler handler_;
  std::array<std::string, host::kReasonCount> reasons_;

  std::mutex mutex_;
  bool stopped_ = false;
  /// Whether the process must not be ended.
  bool outstanding_ = false;

  bool running_ = false;
  int state_ = ActivityStateCheckIn;
  uint32_t questions_ = 0;
  uint32_t steps_ = 0;
  Reason yieldsFor_ = Reason::kNone;
  Reason heldFor_ = Reason::kNone;
  nanoseconds runStart_{};
  nanoseconds runTime_{};
  host::Metrics metrics_;
  bool saidSupplies_ = false;
  bool saidPressure_ = false;
  bool saidMetrics_ = false;
};

thread_local Activity* Activity::serving = nullptr;

struct ActivityCriteria {};

namespace {

constexpr ActivityCriteria kCheckIn;

/// Lives as long as the process: its threads may use it until the very end.
Activity* registered = nullptr;

void attach(const char* identifier, ActivityHandler handler) {
  const host::HostFile& file = host::hostFile();
  const host::ActivitySettings& declared = file.activity;
  if (!file.name.empty() && declared.identifier != identifier) {
    throw host::HostFileError(
        file.name, declared.identifierLine,
        "the host declares activity '" + declared.identifier + "', but none named '" + identifier + "'");
  }
  registered = new Activity(file, identifier, handler);
  registered->announce();
  try {
    std::thread(&Activity::serve, registered).detach();
  } catch (const std::system_error& refusal) {
    throw std::system_error(refusal.code(), "the system refuses a thread");
  }
}

}  // namespace

const ActivityCriteria* const ActivityCheckIn = &kCheckIn;

namespace host {

void stepBegins() {
  if (Activity::serving != nullptr) Activity::serving->stepBegins();
}

void stepEnded(int32_t result, std::optional<uint32_t> reply) {
  if (Activity::serving != nullptr) Activity::serving->stepEnded(result, reply);
}

}  // namespace host

void RegisterActivity(const char* identifier, const ActivityCriteria*, ActivityHandler handler) {
  host::bringUp();
  if (registered != nullptr) {
    host::note("activity %s has its handler already", identifier);
    return;
  }
  host::start([&] { attach(identifier, handler); });
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
  if (Activity::serving != nullptr) Activity::serving->declareClean();
}

void RunMainLoop() {
  host::bringUp();
  for (;;) {
    const int signal = host::awaitStopSignal();
    if (registered == nullptr) host::endProcess(EXIT_SUCCESS, [] {});
    registered->stop(signal);
  }
}
