// The real daemon on the host port, at a terminal: its lines, its exit status, and how it stops.

#include <gtest/gtest.h>
#include <pty.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "ksp/connection.h"
#include "platform/driver_service.h"

namespace {

using Lines = std::vector<std::string>;

/// A run of brellium whose standard error is a terminal that the test reads.
class Daemon {
 public:
  explicit Daemon(const std::string& hostFile) {
    process_ = forkpty(&terminal_, nullptr, nullptr, nullptr);
    if (process_ == 0) {
      setenv("KSP_HOST_FILE", hostFile.c_str(), 1);
      setenv("LD_PRELOAD", KSP_QUICK_SLEEP, 1);
      execl(KSP_BRELLIUM, "brellium", "--ignored", nullptr);
      _exit(127);
    }
  }

  /// The next line, without the program's name and process in front; empty at the end.
  std::string line() {
    std::string text;
    for (char c = 0; read(terminal_, &c, 1) == 1 && c != '\n';) {
      if (c != '\r') text += c;
    }
    const size_t name = text.find("]: ");
    return name == std::string::npos ? text : text.substr(name + 3);
  }

  /// The daemon's own lines up to one that starts with `last`, or all that are left.
  Lines lines(const std::string& last = "no such line") {
    Lines all;
    for (std::string text = line(); !text.empty(); text = line()) {
      if (text.starts_with("host: ")) continue;
      all.push_back(text);
      if (text.starts_with(last)) break;
    }
    return all;
  }

  void signal(int number) const { kill(process_, number); }

  int exitStatus() {
    int status = 0;
    waitpid(process_, &status, 0);
    close(terminal_);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
  }

 private:
  pid_t process_;
  int terminal_ = -1;
};

/// A host file of the test's own, from behind the heading of the activity's table on.
class HostFile {
 public:
  explicit HostFile(const std::string& text) { std::ofstream(name_) << "[activity]\n" << text; }
  ~HostFile() { std::filesystem::remove(name_); }

  const std::string& name() const { return name_; }

 private:
  const std::string name_ = testing::TempDir() + "host" + std::to_string(getpid()) + ".toml";
};

std::string example(const std::string& name) {
  return std::string(KSP_EXAMPLE_HOSTS) + "/" + name + ".toml";
}

const Lines kFlashOpened = {"start brellium", "running brellium",
                            "Fendrel: findNandExporter: Controller found: VantorFlash3NVMeController",
                            "opened io service connection"};

TEST(Brellium, WorksPendingStepsOffAndEnds) {
  Lines expected = kFlashOpened;
  for (const char* text : {"iter# 1 - BEGIN", "iter# 1 - KSP status pass - is BDR done: NO (1)"})
    expected.push_back(text);
  for (char check = '1'; check <= '6'; ++check) {
    expected.push_back(std::string("  - defer chck ") + check + "/6 - sleeping for 5s");
  }
  for (const char* text : {"iter# 1 - DONE sleeping - more BDR", "iter# 2 - BEGIN",
                           "iter# 2 - KSP status pass - is BDR done: YES (0)", "iter# 2 - DONE - no more BDR",
                           "closing io service connection", "stopping brellium daemon"}) {
    expected.push_back(text);
  }
  for (int run = 0; run < 2; ++run) {
    Daemon daemon(example("default"));
    EXPECT_EQ(daemon.lines(), expected);
    EXPECT_EQ(daemon.exitStatus(), 0);
  }
}

TEST(Brellium, HostsWithoutWorkEndAtOnce) {
  const struct {
    const char* host;
    Lines lines;
  } cases[] = {
      {"no-controller", {"start brellium", "running brellium", "stopping brellium daemon"}},
      {"refusing-first", {kFlashOpened[0], kFlashOpened[1], kFlashOpened[2], "stopping brellium daemon"}},
  };
  for (const auto& [host, lines] : cases) {
    Daemon daemon(example(host));
    EXPECT_EQ(daemon.lines(), lines);
    EXPECT_EQ(daemon.exitStatus(), 0);
  }
}

TEST(Brellium, AStopYieldsClosesAndEndsClean) {
  const HostFile endless(
      "identifier = \"com.vantor.brellium\"\n[[controller]]\nclass = \"KSPStorage\"\nsteps = [1]\n");
  for (const int signal : {SIGTERM, SIGINT, SIGHUP}) {
    Daemon daemon(endless.name());
    daemon.lines("  - defer chck 1/6 - sleeping");
    daemon.signal(signal);
    const Lines rest = daemon.lines();
    ASSERT_GE(rest.size(), 4u);
    const Lines end(rest.end() - 4, rest.end());
    EXPECT_TRUE(end[0].starts_with("  - defer chck ") && end[0].ends_with("/6 - deferring!!!!")) << end[0];
    EXPECT_TRUE(end[1].starts_with("iter# ") && end[1].ends_with(" - DONE for now - more BDR")) << end[1];
    EXPECT_EQ(end[2], "closing io service connection");
    EXPECT_EQ(end[3], "deferring brellium daemon");
    EXPECT_EQ(daemon.exitStatus(), 0);
  }
}

TEST(Brellium, ADeferredRunIsTriedAgainUntilAStopWhileIdle) {
  Daemon daemon(example("yield-at-fourth-check"));
  EXPECT_EQ(daemon.lines("deferring brellium").back(), "deferring brellium daemon");
  EXPECT_EQ(daemon.line(), "host: next run in 30 s");
  daemon.signal(SIGTERM);
  EXPECT_EQ(daemon.lines(), Lines{});
  EXPECT_EQ(daemon.exitStatus(), 0);
}

TEST(Brellium, AWrongHostFileStartsNothing) {
  Daemon missing("no/such.toml");
  EXPECT_EQ(missing.lines(), Lines{"brellium: no/such.toml: cannot be read: No such file or directory"});
  EXPECT_EQ(missing.exitStatus(), 78);

  const HostFile other("identifier = \"another\"\n");
  Daemon unknown(other.name());
  EXPECT_EQ(unknown.lines(),
            (Lines{"start brellium", "brellium: " + other.name() +
                                         ":2: the host declares activity 'another', but none "
                                         "named 'com.vantor.brellium'"}));
  EXPECT_EQ(unknown.exitStatus(), 78);
}

TEST(HostDriver, AClientReachesTheControllerThatAccepts) {
  setenv("KSP_HOST_FILE", example("refusing-first").c_str(), 1);
  ExporterEntry* entry = nullptr;
  ASSERT_EQ(findNandExporterNew(&entry), 1);
  EXPECT_STREQ(entry->className, "VantorEmbeddedNVMeController");
  unsigned char request[24] = {39, 0, 0, 0, 1, 4};
  unsigned char reply[4] = {};
  size_t size = sizeof reply;
  EXPECT_EQ(CallStructMethod(entry->connection, entry->tunnelMethod, request, sizeof request, reply, &size),
            0);
  EXPECT_EQ(size, 4u);
  EXPECT_NE(
      CallStructMethod(entry->connection, entry->tunnelMethod + 1, request, sizeof request, reply, &size), 0);
  EXPECT_NE(CallStructMethod(entry->connection, entry->tunnelMethod, request, 23, reply, &size), 0);
  uint32_t untouched = 7;
  EXPECT_NE(OpenServiceConnection(entry->service, getpid() + 1, 0, &untouched), 0);
  EXPECT_NE(OpenServiceConnection(entry->service + 1000, getpid(), 0, &untouched), 0);
  EXPECT_EQ(untouched, 7u);
  const uint32_t connection = entry->connection;
  const uint32_t service = entry->service;
  ReleaseIOInterfaces(entry);
  EXPECT_NE(CloseServiceConnection(connection), 0) << "closed already";
  EXPECT_NE(ReleaseServiceObject(service), 0) << "released already";
}

}  // namespace
