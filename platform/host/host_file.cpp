// SPDX-License-Identifier: Apache-2.0
#include "platform/host/host_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

// What the parser asserts or, in an optimised build, takes for granted, a wrong file can break ("[!"). Unless
// it does either, it goes on and says what is wrong.
#undef NDEBUG
#define TOML_ASSERT(condition) static_cast<void>(0)
#include <toml++/toml.h>
#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <limits>

#include "platform/host/log.h"
#include "platform/host/screen.h"

namespace host {

namespace {

constexpr char kSystemFile[] = "/etc/brellium/host.toml";
/// What the service manager calls its copy of the system's file.
constexpr char kCredential[] = "/brellium_host.toml";
constexpr size_t kGreatestFileSize = size_t{64} << 10;
constexpr uint32_t kGreatestSeconds = 366 * 24 * 60 * 60;

/// The controllers that the host can emulate, and the driver method through which each takes its commands.
struct EmulatedClass {
  std::string_view className;
  uint32_t tunnelMethod;
};
constexpr EmulatedClass kEmulatedClasses[] = {
    {"VantorFlash3NVMeController", 9},
    {"VantorEmbeddedNVMeController", 9},
    {"KSPStorage", 8},
};

/// Reads the keys of one table, each at most once, and then refuses those that nobody asked for.
class TableReader {
 public:
  TableReader(std::string_view file, std::string_view title, const toml::table& table)
      : file_(file), title_(title), table_(table) {}

  [[noreturn]] void fail(const toml::source_region& where, const std::string& fault) const {
    throw HostFileError(file_, where.begin.line, fault);
  }

  [[noreturn]] void fail(const std::string& fault) const { fail(table_.source(), fault); }

  const toml::node* find(std::string_view key) {
    known_.push_back(key);
    return table_.get(key);
  }

  bool flag(std::string_view key) {
    const toml::node* node = find(key);
    if (node == nullptr) return false;
    if (!node->is_boolean()) failType(*node, key, "true or false");
    return *node->value_exact<bool>();
  }

  std::optional<uint32_t> number(std::string_view key, uint32_t least, uint32_t greatest) {
    const toml::node* node = find(key);
    if (node == nullptr) return std::nullopt;
    return number(*node, key, least, greatest);
  }

  uint32_t number(const toml::node& node, std::string_view key, uint32_t least, uint32_t greatest) const {
    if (!node.is_integer()) failType(node, key, "a whole number");
    const int64_t value = *node.value_exact<int64_t>();
    if (value < least || value > greatest) {
      fail(node.source(), quoted(key) + " is " + std::to_string(value) + ", but must be from " +
                              std::to_string(least) + " to " + std::to_string(greatest));
    }
    return static_cast<uint32_t>(value);
  }

  /// A driver's 32-bit result code, 0 when it is absent.
  int32_t result(std::string_view key) {
    return static_cast<int32_t>(number(key, 0, std::numeric_limits<uint32_t>::max()).value_or(0));
  }

  [[noreturn]] void failType(const toml::node& node, std::string_view key, std::string_view kind) const {
    fail(node.source(), quoted(key) + " must be " + std::string(kind));
  }

  void refuseUnknownKeys() const {
    for (const auto& [key, node] : table_) {
      if (std::find(known_.begin(), known_.end(), key.str()) == known_.end()) {
        fail(key.source(), "unknown key " + quoted(key.str()));
      }
    }
  }

 private:
  std::string quoted(std::string_view key) const {
    std::string text = "'";
    if (!title_.empty()) text.append(title_).append(".");
    return text.append(key).append("'");
  }

  std::string_view file_;
  std::string_view title_;
  const toml::table& table_;
  std::vector<std::string_view> known_;
};

ActivitySettings readActivity(TableReader reader) {
  ActivitySettings settings;
  if (const toml::node* node = reader.find("identifier")) {
    if (!node->is_string()) reader.failType(*node, "identifier", "a text");
    settings.identifier = *node->value_exact<std::string>();
    settings.identifierLine = node->source().begin.line;
  } else {
    reader.fail("the activity has no 'identifier'");
  }
  settings.startAfterSeconds = reader.number("start_after_s", 0, kGreatestSeconds).value_or(0);
  settings.retrySeconds = reader.number("retry_s", 1, kGreatestSeconds).value_or(settings.retrySeconds);
  settings.intervalSeconds = reader.number("interval_s", 0, kGreatestSeconds).value_or(0);
  reader.refuseUnknownKeys();
  return settings;
}

YieldSettings readYield(TableReader reader) {
  YieldSettings settings;
  settings.onBattery = reader.flag("on_battery");
  settings.ioPressurePercent = reader.number("io_pressure_percent", 0, 100);
  settings.afterSeconds = reader.number("after_s", 0, kGreatestSeconds);
  settings.atCheck = reader.number("at_check", 1, std::numeric_limits<uint32_t>::max());
  reader.refuseUnknownKeys();
  return settings;
}

std::string readMetrics(TableReader reader) {
  const toml::node* node = reader.find("file");
  if (node == nullptr) reader.fail("the metrics have no 'file'");
  if (!node->is_string()) reader.failType(*node, "file", "a text");
  auto path = *node->value_exact<std::string>();
  if (!path.starts_with('/') || path.find('\0') != std::string::npos) {
    reader.failType(*node, "file", "an absolute path");
  }
  reader.refuseUnknownKeys();
  return path;
}

/// A step is its reply, or a table of reply and result.
Step readStep(const TableReader& controller, std::string_view file, const toml::node& node) {
  constexpr uint32_t kGreatest = std::numeric_limits<uint32_t>::max();
  if (const toml::table* table = node.as_table()) {
    TableReader reader(file, "controller.steps", *table);
    const Step step = {.reply = reader.number("reply", 0, kGreatest).value_or(0),
                       .result = reader.result("result")};
    reader.refuseUnknownKeys();
    return step;
  }
  if (!node.is_integer()) controller.failType(node, "steps", "whole numbers, or tables of reply and result");
  return {.reply = controller.number(node, "steps", 0, kGreatest), .result = 0};
}

std::string knownClasses() {
  std::string names;
  for (const EmulatedClass& known : kEmulatedClasses) {
    names.append(names.empty() ? "" : ", ").append(known.className);
  }
  return names;
}

ControllerSettings readController(std::string_view file, TableReader reader) {
  ControllerSettings settings;
  const toml::node* node = reader.find("class");
  if (node == nullptr) reader.fail("the controller has no 'class'");
  if (!node->is_string()) reader.failType(*node, "class", "a text");
  settings.className = *node->value_exact<std::string>();
  const auto* known = std::find_if(std::begin(kEmulatedClasses), std::end(kEmulatedClasses),
                                   [&](const auto& each) { return each.className == settings.className; });
  if (known == std::end(kEmulatedClasses)) {
    reader.fail(node->source(), "unknown class '" + settings.className + "'; there are " + knownClasses());
  }
  settings.tunnelMethod = known->tunnelMethod;
  if (const toml::node* steps = reader.find("steps")) {
    if (!steps->is_array()) reader.failType(*steps, "steps", "a list");
    for (const toml::node& step : *steps->as_array()) {
      settings.steps.push_back(readStep(reader, file, step));
    }
  }
  settings.openResult = reader.result("open_result");
  settings.closeResult = reader.result("close_result");
  settings.goneAfterLookups = reader.number("gone_after_lookups", 0, std::numeric_limits<uint32_t>::max());
  reader.refuseUnknownKeys();
  return settings;
}

HostFile readHostFile(std::string_view name, const toml::table& root) {
  HostFile file;
  file.name = name;
  TableReader reader(name, "", root);
  if (const toml::node* node = reader.find("activity")) {
    if (!node->is_table()) reader.failType(*node, "activity", "a table");
    file.activity = readActivity({name, "activity", *node->as_table()});
  } else {
    reader.fail("there is no activity: a table [activity] must declare it");
  }
  if (const toml::node* node = reader.find("yield")) {
    if (!node->is_table()) reader.failType(*node, "yield", "a table");
    file.yield = readYield({name, "yield", *node->as_table()});
  }
  if (const toml::node* node = reader.find("metrics")) {
    if (!node->is_table()) reader.failType(*node, "metrics", "a table");
    file.metricsFile = readMetrics({name, "metrics", *node->as_table()});
  }
  if (const toml::node* node = reader.find("controller")) {
    if (!node->is_array()) reader.failType(*node, "controller", "a list of tables: [[controller]]");
    for (const toml::node& controller : *node->as_array()) {
      if (!controller.is_table())
        reader.failType(controller, "controller", "a list of tables: [[controller]]");
      file.controllers.push_back(readController(name, {name, "controller", *controller.as_table()}));
    }
  }
  reader.refuseUnknownKeys();
  return file;
}

std::string faultLine(std::string_view file, unsigned line, std::string_view fault) {
  std::string text(file);
  if (line != 0) text.append(":").append(std::to_string(line));
  text.append(": ").append(fault);
  makePrintable(text);
  return text;
}

/// A file descriptor, closed at the end of its scope.
class OpenFile {
 public:
  explicit OpenFile(const std::string& path)
      : descriptor_(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK)) {}
  OpenFile(const OpenFile&) = delete;
  ~OpenFile() {
    if (descriptor_ >= 0) close(descriptor_);
  }

  int descriptor() const { return descriptor_; }

 private:
  const int descriptor_;
};

bool isLink(const std::string& path) {
  struct stat status = {};
  return lstat(path.c_str(), &status) == 0 && S_ISLNK(status.st_mode);
}

std::string readWhole(const std::string& path) {
  const auto fail = [&](const char* reason) {
    throw HostFileError(path, 0, std::string("cannot be read: ") + reason);
  };
  // Opening a pipe or a device must not wait for its other end; neither is read.
  const OpenFile file(path);
  if (file.descriptor() < 0) {
    if (errno == ENOENT && isLink(path)) fail("it is a link that leads nowhere");
    fail(std::strerror(errno));
  }
  struct stat status = {};
  if (fstat(file.descriptor(), &status) != 0) fail(std::strerror(errno));
  if (!S_ISREG(status.st_mode)) fail("it is not a regular file");
  std::string text(kGreatestFileSize + 1, '\0');
  size_t size = 0;
  while (size < text.size()) {
    const ssize_t got = read(file.descriptor(), text.data() + size, text.size() - size);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) fail(std::strerror(errno));
    if (got == 0) break;
    size += static_cast<size_t>(got);
  }
  if (size > kGreatestFileSize) fail("it is larger than 64 KiB");
  text.resize(size);
  return text;
}

}  // namespace

HostFileError::HostFileError(std::string_view file, unsigned line, std::string_view fault)
    : std::runtime_error(faultLine(file, line, fault)) {}

HostFile parseHostFile(std::string_view text, std::string_view name) {
  if (const auto objection = objectionTo(text)) throw HostFileError(name, objection->line, objection->fault);
  try {
    return readHostFile(name, toml::parse(text, name));
  } catch (const toml::parse_error& error) {
    throw HostFileError(name, error.source().begin.line, error.description());
  }
}

HostFile loadHostFile(const std::string& path) {
  return parseHostFile(readWhole(path), path);
}

HostFile findHostFile(const char* named, const char* credentials, const char* systemFile) {
  if (named != nullptr && *named != 0) return loadHostFile(named);
  struct stat status = {};
  if (credentials != nullptr) {
    const std::string credential = std::string(credentials) + kCredential;
    if (lstat(credential.c_str(), &status) == 0) return loadHostFile(credential);
  }
  if (lstat(systemFile, &status) == 0 || errno != ENOENT) return loadHostFile(systemFile);
  return {};
}

const HostFile& hostFile() {
  // Never destroyed: a client may close its connection as late as its own last global object.
  static const HostFile& file = *new HostFile(
      findHostFile(secure_getenv("KSP_HOST_FILE"), secure_getenv("CREDENTIALS_DIRECTORY"), kSystemFile));
  return file;
}

}  // namespace host
