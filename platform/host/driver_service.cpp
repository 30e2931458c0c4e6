// SPDX-License-Identifier: Apache-2.0
#include "platform/driver_service.h"

#include <unistd.h>

#include <cerrno>
#include <map>
#include <memory>
#include <mutex>
#include <new>
#include <optional>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "platform/host/activity.h"
#include "platform/host/host_file.h"
#include "platform/host/log.h"

const char PropertyMatchKey[] = "PropertyMatch";

struct MatchingRequest {
  std::string className;
};

namespace {

/// The one command that an emulated controller knows: a step of its BDR work.
constexpr size_t kRequestSize = 24;
constexpr uint32_t kTaskSchedulerSelector = 39;
constexpr uint32_t kStepParameter = 0x401;

uint32_t loadLittleEndian(std::span<const unsigned char> bytes) {
  uint32_t value = 0;
  for (unsigned i = 0; i < 4; ++i) value |= uint32_t{bytes[i]} << (8 * i);
  return value;
}

void storeLittleEndian(uint32_t value, std::span<unsigned char> bytes) {
  for (unsigned i = 0; i < 4; ++i) bytes[i] = static_cast<unsigned char>(value >> (8 * i));
}

class EmulatedController {
 public:
  explicit EmulatedController(const host::ControllerSettings& settings) : settings_(settings) {}

  /// Answers a lookup of a class: whether this is a driver of it and still there.
  bool matches(const std::string& className) {
    if (className != settings_.className) return false;
    return !settings_.goneAfterLookups || lookups_++ < *settings_.goneAfterLookups;
  }

  int32_t openResult() const { return settings_.openResult; }
  int32_t closeResult() const { return settings_.closeResult; }

  /// Sets `outputSize` where it answers.
  int32_t call(uint32_t method, std::span<const unsigned char> input, std::span<unsigned char> output,
               size_t& outputSize) {
    if (method != settings_.tunnelMethod) return -ENOSYS;
    if (input.size() != kRequestSize || output.size() < sizeof(uint32_t)) return -EINVAL;
    if (loadLittleEndian(input) != kTaskSchedulerSelector) return -ENOTSUP;
    if (loadLittleEndian(input.subspan(4)) != kStepParameter) return -EINVAL;
    const host::Step step = nextStep();
    storeLittleEndian(step.reply, output);
    outputSize = sizeof(uint32_t);
    return step.result;
  }

 private:
  host::Step nextStep() {
    if (settings_.steps.empty()) return {};
    return settings_.steps[steps_++ % settings_.steps.size()];
  }

  const host::ControllerSettings& settings_;
  uint32_t lookups_ = 0;
  size_t steps_ = 0;
};

/// The drivers of this host, and the handles that were given out and not yet given back.
class Registry {
 public:
  explicit Registry(const std::vector<host::ControllerSettings>& settings)
      : controllers_(settings.begin(), settings.end()) {}

  uint32_t look(const std::string& className) {
    const std::lock_guard lock(mutex_);
    for (EmulatedController& controller : controllers_) {
      if (controller.matches(className)) return give(services_, controller);
    }
    return 0;
  }

  int32_t open(uint32_t service, uint32_t* connection) {
    const std::lock_guard lock(mutex_);
    const auto found = services_.find(service);
    if (found == services_.end()) return -EBADF;
    const int32_t result = found->second->openResult();
    if (result == 0) *connection = give(connections_, *found->second);
    return result;
  }

  int32_t call(uint32_t connection, uint32_t method, std::span<const unsigned char> input,
               std::span<unsigned char> output, size_t& outputSize) {
    const std::lock_guard lock(mutex_);
    const auto found = connections_.find(connection);
    return found == connections_.end() ? -EBADF : found->second->call(method, input, output, outputSize);
  }

  int32_t close(uint32_t connection) {
    const std::lock_guard lock(mutex_);
    const auto found = connections_.find(connection);
    if (found == connections_.end()) return -EBADF;
    const int32_t result = found->second->closeResult();
    connections_.erase(found);
    return result;
  }

  int32_t release(uint32_t service) {
    const std::lock_guard lock(mutex_);
    return services_.erase(service) == 1 ? 0 : -EBADF;
  }

 private:
  using Handles = std::map<uint32_t, EmulatedController*>;

  uint32_t give(Handles& handles, EmulatedController& controller) {
    handles.emplace(++lastHandle_, &controller);
    return lastHandle_;
  }

  std::mutex mutex_;
  std::vector<EmulatedController> controllers_;
  Handles services_;
  Handles connections_;
  uint32_t lastHandle_ = 0;
};

/// Lives as long as the process. With a wrong host file, which a client of the library meets here first, no
/// driver is present.
Registry& registry() {
  static Registry& instance = *[] {
    static const std::vector<host::ControllerSettings> kNone;
    try {
      return new Registry(host::hostFile().controllers);
    } catch (const host::HostFileError& fault) {
      host::report(fault.what());
      return new Registry(kNone);
    }
  }();
  return instance;
}

/// Callers are not made for exceptions: where memory runs out they get `otherwise`.
template <class Result, class Call>
Result unlessOutOfMemory(Result otherwise, Call call) {
  try {
    return call();
  } catch (const std::bad_alloc&) {
    return otherwise;
  }
}

}  // namespace

MatchingRequest* ServiceMatchByClass(const char* className) {
  if (className == nullptr) return nullptr;
  return unlessOutOfMemory<MatchingRequest*>(nullptr, [&] { return new MatchingRequest{className}; });
}

uint32_t GetMatchingService(uint32_t registryNumber, MatchingRequest* request) {
  const std::unique_ptr<MatchingRequest> consumed(request);
  if (registryNumber != DefaultRegistry || consumed == nullptr) return 0;
  return unlessOutOfMemory(uint32_t{0}, [&] { return registry().look(consumed->className); });
}

int32_t OpenServiceConnection(uint32_t service, int32_t process, uint32_t type, uint32_t* connection) {
  if (process != getpid()) return -EPERM;
  if (type != 0 || connection == nullptr) return -EINVAL;
  return unlessOutOfMemory(int32_t{-ENOMEM}, [&] { return registry().open(service, connection); });
}

int32_t CallStructMethod(uint32_t connection, uint32_t method, const void* input, size_t inputSize,
                         void* output, size_t* outputSize) {
  if (outputSize == nullptr) return -EINVAL;
  // Nothing is written until a driver says so.
  const size_t room = std::exchange(*outputSize, 0);
  if (input == nullptr || output == nullptr) return -EINVAL;
  auto* const reply = static_cast<unsigned char*>(output);
  host::stepBegins();
  const int32_t result = unlessOutOfMemory(int32_t{-ENOMEM}, [&] {
    return registry().call(connection, method, {static_cast<const unsigned char*>(input), inputSize},
                           {reply, room}, *outputSize);
  });
  host::stepEnded(result,
                  *outputSize == 0 ? std::nullopt : std::optional(loadLittleEndian({reply, *outputSize})));
  return result;
}

int32_t CloseServiceConnection(uint32_t connection) {
  return unlessOutOfMemory(int32_t{-ENOMEM}, [&] { return registry().close(connection); });
}

int32_t ReleaseServiceObject(uint32_t service) {
  return unlessOutOfMemory(int32_t{-ENOMEM}, [&] { return registry().release(service); });
}
