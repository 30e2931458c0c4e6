// SPDX-License-Identifier: Apache-2.0
#include "tests/scripted_platform.h"

#include <syslog.h>
#include <unistd.h>

#include <cstdarg>
#include <cstdio>

#include "platform/background_activity.h"
#include "platform/driver_service.h"
#include "platform/system_log.h"

namespace scripted {

namespace {

Script script;
std::vector<std::string> recorded;
std::map<uint32_t, std::string> services;
uint32_t lastService;
int lookups;
size_t stepsTaken;
size_t questions;

__attribute__((format(printf, 2, 0))) void recordLog(const char* sink, const char* format,
                                                     va_list arguments) {
  char text[256];
  std::vsnprintf(text, sizeof text, format, arguments);
  recorded.push_back(std::string(sink) + text);
}

__attribute__((format(printf, 1, 2))) void record(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  recordLog("", format, arguments);
  va_end(arguments);
}

std::string hex(const void* bytes, size_t size) {
  std::string text;
  for (size_t i = 0; i < size; ++i) {
    char digits[3];
    std::snprintf(digits, sizeof digits, "%02x", static_cast<const unsigned char*>(bytes)[i]);
    text += digits;
  }
  return text;
}

}  // namespace

void play(Script next) {
  script = std::move(next);
  recorded.clear();
  services.clear();
  lastService = 0x100;
  lookups = 0;
  stepsTaken = questions = 0;
}

const std::vector<std::string>& calls() {
  return recorded;
}

}  // namespace scripted

using namespace scripted;

struct MatchingRequest {
  std::string className;
};
struct ActivityCriteria {};

extern "C" {

const char PropertyMatchKey[] = "PropertyMatch";
const ActivityCriteria kCheckIn;
const ActivityCriteria* const ActivityCheckIn = &kCheckIn;

MatchingRequest* ServiceMatchByClass(const char* className) {
  if (script.unmatchable.count(className) != 0) return nullptr;
  return new MatchingRequest{className};
}

uint32_t GetMatchingService(uint32_t registry, MatchingRequest* request) {
  const std::string className = request->className;
  delete request;
  if (registry != DefaultRegistry || script.present.count(className) == 0) return 0;
  if (script.missingLookups.count(++lookups) != 0) return 0;
  services[++lastService] = className;
  return lastService;
}

int32_t OpenServiceConnection(uint32_t service, int32_t process, uint32_t type, uint32_t* connection) {
  record("open %x type %u%s", service, type, process == getpid() ? "" : " for another process");
  const OpenAnswer answer = script.opens[services.at(service)];
  if (answer.setsHandle) *connection = answer.handle;
  return answer.result;
}

int32_t CallStructMethod(uint32_t connection, uint32_t method, const void* input, size_t inputSize,
                         void* output, size_t* outputSize) {
  record("call %x method %u %s out %s/%zu", connection, method, hex(input, inputSize).c_str(),
         hex(output, *outputSize).c_str(), *outputSize);
  const StepAnswer answer = script.steps.at(stepsTaken++);
  for (unsigned i = 0; i < 4; ++i) static_cast<unsigned char*>(output)[i] = (answer.reply >> (8 * i)) & 0xFF;
  *outputSize = 0;
  return answer.result;
}

int32_t CloseServiceConnection(uint32_t connection) {
  record("close %x", connection);
  return script.closeResult;
}

int32_t ReleaseServiceObject(uint32_t service) {
  record("release %x", service);
  return 0;
}

void RegisterActivity(const char* identifier, const ActivityCriteria* criteria, ActivityHandler) {
  record("register %s%s", identifier, criteria == ActivityCheckIn ? " check-in" : "");
}

int GetActivityState(Activity*) {
  record("state?");
  return script.state;
}

bool ActivityShouldDefer(Activity*) {
  record("defer?");
  return questions < script.yields.size() && script.yields[questions++];
}

bool SetActivityState(Activity*, int state) {
  record("set state %d", state);
  return true;
}

void ExitTransactionClean() {
  record("clean");
}

void SystemLog(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  recordLog("log: ", format, arguments);
  va_end(arguments);
}

void syslog(int priority, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  recordLog(priority == LOG_NOTICE ? "notice: " : "syslog: ", format, arguments);
  va_end(arguments);
}

unsigned sleep(unsigned seconds) {
  record("sleep %u", seconds);
  return 0;
}

}  // extern "C"
