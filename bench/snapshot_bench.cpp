// SPDX-License-Identifier: Apache-2.0
#include <benchmark/benchmark.h>

#include <cstdint>
#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "bench/ratio.h"
#include "ksp/snapshot.h"
#include "tests/plain_snapshot.h"

namespace {

constexpr size_t kRecords = 256;
constexpr size_t kWords = 63;

// Words of random widths, every one up to 32 bits as likely: digit counts that nothing can predict.
std::vector<uint32_t> makeRecords() {
  std::mt19937 random(1);  // NOLINT(cert-msc32-c,cert-msc51-cpp): the same records in each run
  std::vector<uint32_t> words(kRecords * kWords);
  for (uint32_t& word : words) word = static_cast<uint32_t>(uint64_t{random()} >> random() % 32);
  return words;
}

void render(benchmark::State& state, decltype(KSPParseSnapshotBuffer)* renderer) {
  const std::vector<uint32_t> records = makeRecords();
  std::vector<char> out(1 << 20);
  uint64_t size = 0;
  for ([[maybe_unused]] auto _ : state) {
    size = out.size();
    if (renderer(records.data(), records.size() * sizeof records[0], out.data(), &size) != 1) {
      state.SkipWithError("the report does not fit");
      break;
    }
    benchmark::DoNotOptimize(out.data());
  }
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(size));
  state.SetItemsProcessed(state.iterations() * static_cast<int64_t>(kRecords));
}

BENCHMARK_CAPTURE(render, library, KSPParseSnapshotBuffer);
BENCHMARK_CAPTURE(render, plain, ksp::test::plainReport);

}  // namespace

int main(int argc, char** argv) {
  constexpr ksp::Ratio kRatios[] = {{"render/plain", "render/library", "at least 4"}};
  return ksp::runWithRatios(argc, argv, kRatios);
}
