// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdio>
#include <map>
#include <span>
#include <string>
#include <vector>

namespace ksp {

/// Two benchmarks of one run whose times are compared, and what their ratio is to reach.
struct Ratio {
  const char* numerator;
  const char* denominator;
  const char* goal;
};

/// Prints the statistics of repeated runs and keeps every benchmark's least disturbed time.
class RatioReporter : public benchmark::ConsoleReporter {
 public:
  void ReportRuns(const std::vector<Run>& runs) override {
    std::vector<Run> shown;
    for (const Run& run : runs) {
      if (run.run_type == Run::RT_Aggregate || run.error_occurred) shown.push_back(run);
      if (run.run_type == Run::RT_Aggregate || run.error_occurred) continue;
      const double time = run.GetAdjustedCPUTime();
      const auto [place, isNew] = least_.emplace(run.run_name.function_name, time);
      if (!isNew) place->second = std::min(place->second, time);
    }
    ConsoleReporter::ReportRuns(shown);
  }

  /// Leaves out a ratio of which a benchmark was not run.
  void print(const Ratio& ratio) const {
    const auto above = least_.find(ratio.numerator);
    const auto below = least_.find(ratio.denominator);
    if (above == least_.end() || below == least_.end()) return;
    std::printf("%-32s : %-32s = %6.2f  (goal: %s)\n", ratio.numerator, ratio.denominator,
                above->second / below->second, ratio.goal);
  }

 private:
  std::map<std::string, double> least_;
};

/// The main function of a benchmark program that ends with its ratios. Runs are repeated and interleaved, so
/// that a disturbance does not fall on one of them alone; the command line has the last word.
inline int runWithRatios(int argc, char** argv, std::span<const Ratio> ratios) {
  std::vector<std::string> own = {argv[0], "--benchmark_repetitions=10", "--benchmark_min_time=0.05",
                                  "--benchmark_enable_random_interleaving=true"};
  own.insert(own.end(), argv + 1, argv + argc);
  std::vector<char*> arguments;
  arguments.reserve(own.size());
  for (std::string& argument : own) arguments.push_back(argument.data());
  int count = static_cast<int>(arguments.size());
  benchmark::Initialize(&count, arguments.data());
  if (benchmark::ReportUnrecognizedArguments(count, arguments.data())) return 1;
  RatioReporter reporter;
  benchmark::RunSpecifiedBenchmarks(&reporter);
  benchmark::Shutdown();
  for (const Ratio& ratio : ratios) reporter.print(ratio);
  return 0;
}

}  // namespace ksp
