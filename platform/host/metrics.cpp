// SPDX-License-Identifier: Apache-2.0
#include "platform/host/metrics.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>

namespace host {

namespace {

/// Families of samples, one after another.
class Exposition {
 public:
  void family(std::string_view name, std::string_view type, std::string_view help) {
    name_ = name;
    append("# HELP ", name, " ").append(help).append("\n");
    append("# TYPE ", name, " ").append(type).append("\n");
  }

  void sample(const std::string& value) { append(name_, " ", value).append("\n"); }

  void sample(std::string_view key, std::string_view label, const std::string& value) {
    append(name_, "{", key).append("=\"").append(label).append("\"} ").append(value).append("\n");
  }

  std::string take() { return std::move(text_); }

 private:
  std::string& append(std::string_view first, std::string_view second, std::string_view third) {
    return text_.append(first).append(second).append(third);
  }

  std::string_view name_;
  std::string text_;
};

std::string inSeconds(std::chrono::milliseconds time) {
  const std::string fraction = std::to_string(1000 + time.count() % 1000);
  return std::to_string(time.count() / 1000) + '.' + fraction.substr(1);
}

int writeAll(int file, std::string_view text) {
  while (!text.empty()) {
    const ssize_t written = write(file, text.data(), text.size());
    if (written < 0 && errno == EINTR) continue;
    if (written < 0) return errno;
    text.remove_prefix(static_cast<size_t>(written));
  }
  return 0;
}

}  // namespace

std::string exposition(const Metrics& metrics) {
  Exposition text;
  text.family("brellium_runs_total", "counter", "Runs of the activity that began.");
  text.sample(std::to_string(metrics.runs));
  text.family("brellium_steps_total", "counter", "Steps that the controller was asked for, by their result.");
  text.sample("result", "pass", std::to_string(metrics.stepsPassed));
  text.sample("result", "fail", std::to_string(metrics.stepsFailed));
  text.family("brellium_deferrals_total", "counter",
              "Runs that were deferred, or held back when they were due, by the reason to yield.");
  for (const Reason reason :
       {Reason::kBattery, Reason::kPressure, Reason::kTime, Reason::kStop, Reason::kCheck}) {
    text.sample("reason", label(reason), std::to_string(metrics.deferrals[static_cast<size_t>(reason)]));
  }
  text.family("brellium_run_seconds_total", "counter", "Time that runs have lasted.");
  text.sample(inSeconds(metrics.runTime));
  if (metrics.workPending) {
    text.family("brellium_work_pending", "gauge", "Whether work remained at the controller's last reply.");
    text.sample(*metrics.workPending ? "1" : "0");
  }
  if (metrics.lastFinish) {
    text.family("brellium_last_finish_timestamp_seconds", "gauge",
                "When a run last finished without being deferred.");
    text.sample(std::to_string(*metrics.lastFinish));
  }
  return text.take();
}

int replaceFile(const std::string& path, std::string_view text) {
  const std::string next = path + ".new";
  const int file =
      open(next.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK, 0644);
  if (file < 0) return errno;
  int error = writeAll(file, text);
  // The process's mask may be narrower than what the exporter needs.
  if (error == 0 && fchmod(file, 0644) != 0) error = errno;
  if (close(file) != 0 && error == 0) error = errno;
  if (error == 0 && std::rename(next.c_str(), path.c_str()) != 0) error = errno;
  if (error != 0) unlink(next.c_str());
  return error;
}

}  // namespace host
