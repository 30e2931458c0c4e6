#pragma once

#include <benchmark/benchmark.h>

#include <cstdio>
#include <map>
#include <string>
#include <vector>

namespace ksp {

/// Two benchmarks of one run: how many times as long `yardstick` takes as `library`.
struct Ratio {
  const char* yardstick;
  const char* library;
};

/// Runs the registered benchmarks as the command line says, then prints a line for each ratio of which both
/// sides ran; of repeated runs the fastest counts. Returns the program's exit status.
inline int runWithRatios(int argc, char** argv, const std::vector<Ratio>& ratios) {
  class Reporter : public benchmark::ConsoleReporter {
   public:
    void ReportRuns(const std::vector<Run>& runs) override {
      for (const Run& run : runs) {
        if (run.run_type != Run::RT_Iteration || run.error_occurred) continue;
        const double time = run.real_accumulated_time / static_cast<double>(run.iterations);
        const auto [fastest, first] = seconds.try_emplace(run.run_name.function_name, time);
        if (!first && time < fastest->second) fastest->second = time;
      }
      ConsoleReporter::ReportRuns(runs);
    }
    std::map<std::string, double> seconds;
  };
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 2;
  Reporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  for (const auto& [yardstick, library] : ratios) {
    if (!reporter.seconds.contains(yardstick) || !reporter.seconds.contains(library)) continue;
    std::printf("ratio %s / %s: %.2f\n", yardstick, library,
                reporter.seconds[yardstick] / reporter.seconds[library]);
  }
  return 0;
}

}  // namespace ksp
