// SPDX-License-Identifier: Apache-2.0
#include "platform/host/policy.h"

namespace host {

Reason reasonOfRun(const YieldSettings& settings, const RunFigures& figures) {
  if (figures.stopRequested) return Reason::kStop;
  if (settings.atCheck && figures.questions >= *settings.atCheck) return Reason::kCheck;
  if (settings.afterSeconds && figures.lasted >= std::chrono::seconds(*settings.afterSeconds)) {
    return Reason::kTime;
  }
  return Reason::kNone;
}

Reason reasonOfMachine(const YieldSettings& settings, const MachineFigures& figures) {
  if (settings.onBattery && figures.onBattery.value_or(false)) return Reason::kBattery;
  if (settings.ioPressurePercent && figures.ioPressurePercent &&
      *figures.ioPressurePercent > *settings.ioPressurePercent) {
    return Reason::kPressure;
  }
  return Reason::kNone;
}

std::string describe(Reason reason, const YieldSettings& settings) {
  switch (reason) {
    case Reason::kNone:
      break;
    case Reason::kStop:
      return "the process is being stopped";
    case Reason::kCheck:
      return "check " + std::to_string(settings.atCheck.value_or(0));
    case Reason::kTime:
      return "the run has lasted " + std::to_string(settings.afterSeconds.value_or(0)) + " s";
    case Reason::kBattery:
      return "on battery";
    case Reason::kPressure:
      return "I/O pressure above " + std::to_string(settings.ioPressurePercent.value_or(0)) + " %";
  }
  return {};
}

std::string_view label(Reason reason) {
  switch (reason) {
    case Reason::kNone:
      break;
    case Reason::kStop:
      return "stop";
    case Reason::kCheck:
      return "check";
    case Reason::kTime:
      return "time";
    case Reason::kBattery:
      return "battery";
    case Reason::kPressure:
      return "pressure";
  }
  return {};
}

}  // namespace host
