// SPDX-License-Identifier: Apache-2.0
// The real daemon on the host port, at a terminal: its lines, its exit status, and how it stops.

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <pty.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <map>
#include <regex>
#include <string>
#include <thread>
#include <vector>

#include "ksp/connection.h"
#include "platform/background_activity.h"
#include "platform/driver_service.h"
#include "platform/main_loop.h"
#include "tests/folder.h"

namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;
using Lines = std::vector<std::string>;
using std::chrono::milliseconds;

/// No test waits longer for a daemon, and no one waits for a test.
constexpr milliseconds kPatience(20000);

/// What a daemon's seconds take, quickened.
constexpr milliseconds quickened(int seconds) {
  return milliseconds(10) * seconds;
}

void changeNothing() {}

/// A run of brellium whose standard error is a terminal that the test reads.
class Daemon {
 public:
  explicit Daemon(const std::string& hostFile, const std::function<void()>& prepare = changeNothing) {
    process_ = forkpty(&terminal_, nullptr, nullptr, nullptr);
    if (process_ == 0) {
      setenv("KSP_HOST_FILE", hostFile.c_str(), 1);
      setenv("LD_PRELOAD", KSP_QUICK_MACHINE, 1);
      prepare();
      execl(KSP_BRELLIUM, "brellium", "--ignored", nullptr);
      _exit(127);
    }
    if (process_ < 0) std::abort();  // a signal to process -1 would reach every other
  }

  ~Daemon() {
    if (process_ < 0) return;
    signal(SIGKILL);
    exitStatus();
  }

  /// The next line, without the program's name and process in front; empty at the end. The test fails with
  /// what it saw when none comes in time.
  std::string line() {
    std::string text;
    for (char c = 0; next(c) && c != '\n';) {
      if (c != '\r') text += c;
    }
    seen_ += "  " + text + "\n";
    const size_t name = text.find("]: ");
    return name == std::string::npos ? text : text.substr(name + 3);
  }

  /// All lines up to one that starts with `last`, or all that are left.
  Lines allLines(const std::string& last = "no such line") {
    Lines all;
    for (std::string text = line(); !text.empty(); text = line()) {
      all.push_back(text);
      if (text.starts_with(last)) break;
    }
    return all;
  }

  /// The daemon's own among them.
  Lines lines(const std::string& last = "no such line") {
    Lines own = allLines(last);
    std::erase_if(own, [](const std::string& text) { return text.starts_with("host: "); });
    return own;
  }

  void type(char key) const { EXPECT_EQ(write(terminal_, &key, 1), 1); }
  void signal(int number) const {
    ASSERT_GT(process_, 0);
    kill(process_, number);
  }

  /// The exit status, or the negative number of the signal that ended it.
  int exitStatus() {
    int status = 0;
    while (waitpid(process_, &status, WNOHANG) == 0) {
      if (Clock::now() > end_) giveUp("it does not end");
      std::this_thread::sleep_for(milliseconds(1));
    }
    process_ = -1;
    close(terminal_);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
  }

 private:
  bool next(char& c) {
    const auto left = std::chrono::duration_cast<milliseconds>(end_ - Clock::now()).count();
    pollfd readable = {.fd = terminal_, .events = POLLIN, .revents = 0};
    if (poll(&readable, 1, static_cast<int>(std::max(left, milliseconds::rep{0}))) == 0)
      giveUp("its next line does not come");
    return read(terminal_, &c, 1) == 1;
  }

  void giveUp(const char* what) {
    if (end_ != Clock::time_point::max()) ADD_FAILURE() << what << "; it said:\n" << seen_;
    end_ = Clock::time_point::max() - kPatience;
    kill(process_, SIGKILL);
  }

  pid_t process_;
  int terminal_ = -1;
  Clock::time_point end_ = Clock::now() + kPatience;
  std::string seen_;
};

/// Where the daemon finds its host file and its machine.
class Brellium : public FolderTest {
 protected:
  Brellium() { setenv("KSP_TEST_MACHINE", folder_.c_str(), 1); }

  /// A host file, from behind the activity's identifier on.
  std::string host(const std::string& text) const {
    write("host.toml", "[activity]\nidentifier = \"com.vantor.brellium\"\n" + text);
    return path("host.toml");
  }

  /// The same where the daemon writes its metrics.
  std::string measuredHost(const std::string& metrics, const std::string& text) const {
    return host(text + "\n[metrics]\nfile = \"" + path(metrics) + "\"\n");
  }

  void expectSamples(const std::string& metrics, const Lines& samples) const {
    const std::string text = read(metrics);
    for (const std::string& sample : samples)
      EXPECT_NE(text.find("\n" + sample + "\n"), std::string::npos) << sample << " is not in\n" << text;
  }
};

const std::string kEndless = "[[controller]]\nclass = \"KSPStorage\"\nsteps = [1]\n";

std::string joined(const Lines& lines) {
  std::string text;
  for (const std::string& line : lines) text += line + '\n';
  return text;
}

size_t count(const Lines& lines, const std::string& start) {
  return static_cast<size_t>(std::count_if(lines.begin(), lines.end(),
                                           [&](const std::string& line) { return line.starts_with(start); }));
}

TEST_F(Brellium, RunsEachExampleHost) {
  // Those that do not end by themselves, and the line at which each is stopped.
  const std::map<std::string, std::string> stops = {{"periodic", "host: next run in 3600 s"},
                                                    {"yield-at-fourth-check", "host: next run in 30 s"}};
  for (const auto& file : fs::directory_iterator(KSP_EXAMPLE_HOSTS)) {
    const std::string name = file.path().stem();
    const auto stop = stops.find(name);
    Daemon daemon(file.path());
    EXPECT_EQ(joined(daemon.lines(stop == stops.end() ? "no such line" : stop->second)),
              textOf(KSP_TEST_DATA "/runs/" + name + ".txt"));
    if (stop != stops.end()) {
      daemon.signal(SIGTERM);
      EXPECT_EQ(daemon.allLines(), Lines{"host: SIGTERM: ending the process"});
    }
    EXPECT_EQ(daemon.exitStatus(), 0) << name;
  }
}

TEST_F(Brellium, TellsWhatTheHostHas) {
  const std::string file = host(
      "[yield]\non_battery = true\nio_pressure_percent = 5\n"
      "[[controller]]\nclass = \"KSPStorage\"\n[[controller]]\nclass = \"VantorFlash3NVMeController\"\n");
  EXPECT_EQ(Daemon(file).allLines("running"),
            (Lines{"start brellium", "host: host file " + file, "host: emulating KSPStorage",
                   "host: emulating VantorFlash3NVMeController",
                   "host: on_battery never holds: /sys/class/power_supply tells nothing here",
                   "host: io_pressure_percent never holds: /proc/pressure/io tells nothing here",
                   "host: running activity com.vantor.brellium", "running brellium"}));
}

TEST_F(Brellium, AStopYieldsClosesAndEndsClean) {
  const std::string file = host(kEndless);
  for (const int signal : {SIGTERM, SIGINT, SIGHUP}) {
    Daemon daemon(file);
    daemon.lines("  - defer chck 1/6 - sleeping");
    daemon.signal(signal);
    const std::regex end(
        "  - defer chck ./6 - deferring!!!!\n"
        "iter# . - DONE for now - more BDR\n"
        "closing io service connection\n"
        "deferring brellium daemon\n$");
    const std::string rest = joined(daemon.lines());
    EXPECT_TRUE(std::regex_search(rest, end)) << rest;
    EXPECT_EQ(daemon.exitStatus(), 0);
  }
}

TEST_F(Brellium, AStopSignalThatIsIgnoredStaysSo) {
  Daemon daemon(host(kEndless), [] { ::signal(SIGHUP, SIG_IGN); });
  daemon.lines("  - defer chck 1/6 - sleeping");
  daemon.signal(SIGHUP);
  EXPECT_EQ(count(daemon.lines("iter# 3 - BEGIN"), "iter# 2 - DONE sleeping"), 1u);
  daemon.signal(SIGTERM);
  EXPECT_EQ(count(daemon.allLines(), "host: asking to yield: the process is being stopped"), 1u);
  EXPECT_EQ(daemon.exitStatus(), 0);
}

TEST_F(Brellium, AStalledLogDelaysNoStop) {
  Daemon daemon(host("start_after_s = 100000\n"));
  EXPECT_EQ(daemon.allLines("host: next run").back(), "host: next run in 100000 s");
  daemon.type('S' - '@');
  std::this_thread::sleep_for(milliseconds(50));
  const auto before = Clock::now();
  daemon.signal(SIGTERM);
  EXPECT_EQ(daemon.exitStatus(), 0);
  EXPECT_LT(Clock::now() - before, milliseconds(5000));
}

TEST_F(Brellium, ItsTimesAreTheHostFiles) {
  Daemon daemon(
      host("start_after_s = 30\nretry_s = 20\ninterval_s = 40\n[yield]\nat_check = 2\n"
           "[[controller]]\nclass = \"KSPStorage\"\nsteps = [1, 0]\n"));
  // The steps start over: every other run is deferred, and behind each the next one begins in its time.
  for (const int pause : {30, 20, 40, 20, 40}) {
    const Lines before = daemon.allLines("host: next run in ");
    EXPECT_EQ(before.back(), "host: next run in " + std::to_string(pause) + " s");
    const auto idle = Clock::now();
    EXPECT_EQ(daemon.line(), "host: running activity com.vantor.brellium");
    EXPECT_GT(Clock::now() - idle, quickened(pause) * 8 / 10);
    EXPECT_LT(Clock::now() - idle, quickened(pause) * 8 / 10 + milliseconds(2000));
  }
}

TEST_F(Brellium, ARunYieldsOnceItHasLasted) {
  Daemon daemon(host("[yield]\nafter_s = 23\n" + kEndless));
  const Lines lines = daemon.allLines("deferring");
  EXPECT_EQ(count(lines, "host: asking to yield: the run has lasted 23 s"), 1u);
  EXPECT_EQ(lines.back(), "deferring brellium daemon");
  EXPECT_LE(count(lines, "  - defer chck "), 6u) << "asked at 25 s at the latest";
  EXPECT_GE(count(lines, "  - defer chck "), 2u);
}

// The machine's pressure comes through a pipe, a figure a question: there is none behind the one that asks to
// yield.
class Pressure : public Brellium {
 protected:
  Pressure() : pipe_(path("proc/pressure/io")) {
    fs::create_directories(path("proc/pressure"));
    EXPECT_EQ(mkfifo(pipe_.c_str(), 0600), 0);
  }

  /// Answers the next question.
  void answer(const std::string& percent) const {
    const auto end = Clock::now() + kPatience;
    int pipe = -1;
    while ((pipe = open(pipe_.c_str(), O_WRONLY | O_NONBLOCK)) < 0 && Clock::now() < end) {
      std::this_thread::sleep_for(milliseconds(1));
    }
    ASSERT_GE(pipe, 0) << "nobody asks for the pressure";
    // The next question is to find a pipe of its own, not the rest of this one.
    const std::string next = pipe_ + ".next";
    ASSERT_EQ(mkfifo(next.c_str(), 0600), 0);
    fs::rename(next, pipe_);
    const std::string text = "some avg10=" + percent + " avg60=0.00 avg300=0.00 total=0\n";
    EXPECT_EQ(::write(pipe, text.data(), text.size()), static_cast<ssize_t>(text.size()));
    close(pipe);
  }

  const std::string pipe_;
};

TEST_F(Pressure, ARunThatWasAskedToYieldIsDeferredThoughItHasPassed) {
  Daemon daemon(host("[yield]\nio_pressure_percent = 40\n" + kEndless));
  for (const char* percent : {"0.00", "40.00", "12.00", "40.01"}) answer(percent);
  const Lines lines = daemon.lines("deferring");
  EXPECT_EQ(lines.back(), "deferring brellium daemon");
  EXPECT_EQ(count(lines, "  - defer chck 1/6 - sleeping"), 1u);
  EXPECT_EQ(count(lines, "  - defer chck 2/6 - deferring!!!!"), 1u);
  EXPECT_EQ(daemon.line(), "host: next run in 60 s");
}

TEST_F(Pressure, AConditionThatHangsDelaysNoStop) {
  Daemon daemon(host("[yield]\nio_pressure_percent = 40\n" + kEndless));
  answer("0.00");
  std::this_thread::sleep_for(milliseconds(50));
  daemon.signal(SIGTERM);
  const Lines lines = daemon.allLines();
  EXPECT_EQ(lines.back(), "host: SIGTERM: ending the process");
  EXPECT_EQ(count(lines, "host: running"), 0u);
  EXPECT_EQ(daemon.exitStatus(), 0);
}

TEST_F(Brellium, NoRunBeginsOnBattery) {
  write("sys/class/power_supply/BAT0/type", "Battery");
  write("sys/class/power_supply/BAT0/status", "Discharging");
  write("sys/class/power_supply/AC/online", "0");
  Daemon daemon(measuredHost("metrics", "retry_s = 10\n[yield]\non_battery = true"));
  daemon.allLines("host: no run begins: on battery; asking again every 10 s");
  std::this_thread::sleep_for(quickened(50));
  expectSamples("metrics", {"brellium_deferrals_total{reason=\"battery\"} 1"});
  write("sys/class/power_supply/AC/online", "1");
  EXPECT_EQ(daemon.allLines(),
            (Lines{"host: running activity com.vantor.brellium", "running brellium",
                   "stopping brellium daemon", "host: the activity has finished, ending the process"}))
      << "why no run began is said once";
  EXPECT_EQ(daemon.exitStatus(), 0);
}

TEST_F(Brellium, DriversFailAsTheHostFileSays) {
  Daemon closing(
      host("interval_s = 1\n[[controller]]\nclass = \"KSPStorage\"\nclose_result = 5\n"
           "gone_after_lookups = 1\n"));
  const Lines first = closing.lines("stopping");
  EXPECT_EQ(Lines(first.end() - 3, first.end()),
            (Lines{"closing io service connection", "error closing connection to service",
                   "stopping brellium daemon"}));
  EXPECT_EQ(closing.lines("stopping"), (Lines{"running brellium", "stopping brellium daemon"}))
      << "it is gone";
}

TEST_F(Brellium, AWrongHostFileStartsNothing) {
  Daemon missing("no/such.toml");
  EXPECT_EQ(missing.lines(), Lines{"brellium: no/such.toml: cannot be read: No such file or directory"});
  EXPECT_EQ(missing.exitStatus(), 78);

  write("other.toml", "[activity]\nidentifier = \"another\"");
  Daemon unknown(path("other.toml"));
  EXPECT_EQ(unknown.lines(),
            (Lines{"start brellium", "brellium: " + path("other.toml") +
                                         ":2: the host declares activity 'another', but none "
                                         "named 'com.vantor.brellium'"}));
  EXPECT_EQ(unknown.exitStatus(), 78);

  Daemon unread("no/such.toml", [] {
    int ends[2];
    if (pipe(ends) != 0 || dup2(ends[1], STDERR_FILENO) < 0) _exit(126);
    close(ends[0]);
  });
  EXPECT_EQ(unread.exitStatus(), 78) << "with nobody to read the line";
}

#ifndef KSP_UNLIMITED
TEST_F(Brellium, WhatTheSystemRefusesEndsWithALineAndItsStatus) {
  Daemon threadless(host(kEndless), [] {
    const rlimit boundless = {.rlim_cur = rlim_t{1} << 50, .rlim_max = RLIM_INFINITY};
    if (setrlimit(RLIMIT_STACK, &boundless) != 0) _exit(126);
  });
  EXPECT_EQ(threadless.allLines().back(),
            "brellium: the system refuses a thread: Resource temporarily unavailable");
  EXPECT_EQ(threadless.exitStatus(), 71);

  // Whichever piece of the start memory runs out for: the loader's own failure is 127.
  int refused = 0;
  for (rlim_t kibibytes = 200; kibibytes <= 1200; kibibytes += 25) {
    Daemon daemon(host(kEndless), [&] {
      const rlimit limit = {.rlim_cur = kibibytes << 10, .rlim_max = kibibytes << 10};
      if (setrlimit(RLIMIT_DATA, &limit) != 0) _exit(126);
    });
    const int status = daemon.exitStatus();
    EXPECT_TRUE(status == 71 || status == 127) << status << " with " << kibibytes << " KiB";
    refused += status == 71 ? 1 : 0;
  }
  EXPECT_GT(refused, 0);
}
#endif

TEST_F(Brellium, KeepsItsMetrics) {
  Daemon daemon(measuredHost("prom",
                             "interval_s = 1000\n[yield]\nat_check = 8\n[[controller]]\n"
                             "class = \"KSPStorage\"\nsteps = [1, 1, {reply = 1, result = 7}]"));
  daemon.allLines("  - defer chck 1/6");
  expectSamples("prom", {"brellium_steps_total{result=\"pass\"} 1"});
  daemon.allLines("host: next run in 60 s");
  expectSamples("prom", {"brellium_runs_total 1", "brellium_steps_total{result=\"pass\"} 2",
                         "brellium_deferrals_total{reason=\"check\"} 1", "brellium_work_pending 1"});
  const std::string afterFirst = read("prom");
  EXPECT_EQ(afterFirst.find("timestamp"), std::string::npos) << "no run has finished";
  const double lasted = std::stod(afterFirst.substr(afterFirst.find("\nbrellium_run_seconds_total ") + 28));
  EXPECT_GE(lasted, 35);
  EXPECT_LT(lasted, 350);
  daemon.allLines("host: next run in 1000 s");
  expectSamples("prom", {"brellium_runs_total 2", "brellium_steps_total{result=\"fail\"} 1"});
  const std::string afterSecond = read("prom");
  const long finish = std::stol(afterSecond.substr(afterSecond.rfind(' ')));
  EXPECT_NEAR(static_cast<double>(finish), static_cast<double>(time(nullptr)), 20);
  daemon.signal(SIGTERM);
  EXPECT_EQ(daemon.exitStatus(), 0);
  const std::string check = "cd '" + folder_.string() + "' && promtool check metrics <prom >said 2>&1";
  // NOLINTNEXTLINE(cert-env33-c): a shell redirects
  EXPECT_EQ(std::system(check.c_str()), 0);
  EXPECT_EQ(read("said"), "");
}

TEST_F(Brellium, MetricsThatCannotBeWrittenAreSaidOnce) {
  Daemon daemon(measuredHost("no/prom", "[[controller]]\nclass = \"KSPStorage\"\nsteps = [1, 0]"));
  const Lines lines = daemon.allLines();
  EXPECT_EQ(count(lines, "host: no metrics: " + path("no/prom") + ": No such file or directory"), 1u);
  EXPECT_EQ(count(lines, "stopping brellium daemon"), 1u);
  EXPECT_EQ(daemon.exitStatus(), 0);
}

TEST_F(Brellium, TellsTheServiceManagerWhatGoesOn) {
  const int manager = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  sockaddr_un address = {.sun_family = AF_UNIX, .sun_path = {}};
  path("notify").copy(address.sun_path, sizeof address.sun_path - 1);
  ASSERT_EQ(bind(manager, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  const timeval patience = {.tv_sec = 10, .tv_usec = 0};
  setsockopt(manager, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
  const auto told = [&] {
    char text[256];
    const ssize_t size = recv(manager, text, sizeof text, 0);
    return std::string(text, static_cast<size_t>(std::max<ssize_t>(size, 0)));
  };
  write("sys/class/power_supply/BAT0/type", "Battery");
  write("sys/class/power_supply/BAT0/status", "Discharging");
  Daemon daemon(host("start_after_s = 20\n[yield]\non_battery = true\nat_check = 7\n" + kEndless),
                [&] { setenv("NOTIFY_SOCKET", path("notify").c_str(), 1); });
  EXPECT_EQ(told(), "READY=1");
  EXPECT_TRUE(told().starts_with("STATUS=idle until 20"));
  EXPECT_TRUE(told().starts_with("STATUS=idle, on battery; asking again at 20"));
  write("sys/class/power_supply/BAT0/status", "Full");
  for (const char* text : {"STATUS=running", "STATUS=running, step 1", "STATUS=running, step 2",
                           "STATUS=asked to yield: check 7"}) {
    EXPECT_EQ(told(), text);
  }
  EXPECT_TRUE(told().starts_with("STATUS=idle until 20"));
  daemon.signal(SIGTERM);
  EXPECT_EQ(told(), "STOPPING=1\nSTATUS=stopping");
  EXPECT_EQ(daemon.exitStatus(), 0);
  close(manager);
}

// Only a running activity's state is set, only to deferred, and only once.
void setStates(Activity* activity) {
  const bool runs = GetActivityState(activity) == ActivityStateRun;
  if (SetActivityState(activity, ActivityStateRun) || SetActivityState(activity, ActivityStateDefer) != runs)
    _exit(1);
  if (runs) _exit(SetActivityState(activity, ActivityStateDefer) ? 2 : 42);
}

TEST_F(Brellium, AHandlerSetsNoStateButDeferred) {
  setenv("KSP_HOST_FILE", host("").c_str(), 1);
  const auto serve = [] {
    RegisterActivity("com.vantor.brellium", ActivityCheckIn, setStates);
    RunMainLoop();
  };
  EXPECT_EXIT(serve(), testing::ExitedWithCode(42), "");
}

TEST(HostDriver, AClientReachesTheControllerThatAccepts) {
  setenv("KSP_HOST_FILE", KSP_EXAMPLE_HOSTS "/refusing-first.toml", 1);
  ExporterEntry* entry = nullptr;
  ASSERT_EQ(findNandExporterNew(&entry), 1);
  EXPECT_STREQ(entry->className, "VantorEmbeddedNVMeController");
  unsigned char reply[4] = {7, 7, 7, 7};
  const auto call = [&](uint32_t connection, uint32_t method, unsigned char selector, unsigned char parameter,
                        size_t inputSize, size_t& room) {
    const unsigned char request[24] = {selector, 0, 0, 0, parameter, 4};
    return CallStructMethod(connection, method, request, inputSize, reply, &room);
  };
  const uint32_t connection = entry->connection;
  const uint32_t service = entry->service;
  const uint32_t method = entry->tunnelMethod;
  for (int refusal = 0; refusal < 6; ++refusal) {
    size_t room = refusal == 0 ? 3 : 4;
    EXPECT_NE(call(connection + (refusal == 1 ? 1000 : 0), method + (refusal == 2 ? 1 : 0),
                   refusal == 3 ? 38 : 39, refusal == 4 ? 2 : 1, refusal == 5 ? 23 : 24, room),
              0)
        << refusal;
    EXPECT_EQ(room, 0u) << refusal;
    EXPECT_EQ(reply[0], 7) << refusal;
  }
  size_t room = 100;
  EXPECT_NE(CallStructMethod(connection, method, nullptr, 24, reply, &room), 0);
  EXPECT_EQ(room, 0u);
  room = 4;
  EXPECT_EQ(call(connection, method, 39, 1, 24, room), 0);
  EXPECT_EQ(room, 4u);
  EXPECT_EQ(reply[0], 0);
  uint32_t untouched = 7;
  EXPECT_NE(OpenServiceConnection(service, getpid() + 1, 0, &untouched), 0);
  EXPECT_NE(OpenServiceConnection(service, getpid(), 1, &untouched), 0);
  EXPECT_NE(OpenServiceConnection(service, getpid(), 0, nullptr), 0);
  EXPECT_NE(OpenServiceConnection(service + 1000, getpid(), 0, &untouched), 0);
  EXPECT_EQ(untouched, 7u);
  ReleaseIOInterfaces(entry);
  EXPECT_NE(CloseServiceConnection(connection), 0) << "closed already";
  EXPECT_NE(ReleaseServiceObject(service), 0) << "released already";
  EXPECT_EQ(GetMatchingService(DefaultRegistry + 1, ServiceMatchByClass("VantorFlash3NVMeController")), 0u);
  EXPECT_EQ(GetMatchingService(DefaultRegistry, nullptr), 0u);
  EXPECT_EQ(ServiceMatchByClass(nullptr), nullptr);
}

}  // namespace
