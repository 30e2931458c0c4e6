// SPDX-License-Identifier: Apache-2.0
// Writes example captures: all keys, counters that grow from one day to the next, histograms with a shape, a
// day of snapshots. The same seed gives the same bytes everywhere.

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <random>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "ksp/records.hpp"

namespace {

using Bytes = std::vector<char>;

constexpr uint64_t kUsualSeed = 20;

class Random {
 public:
  explicit Random(uint64_t seed) : engine_(seed) {}

  /// From `least` to `greatest`. The slight bias does not matter here; being the same everywhere does.
  uint64_t between(uint64_t least, uint64_t greatest) { return least + engine_() % (greatest - least + 1); }

  /// A number whose magnitude, not whose value, is spread evenly.
  uint64_t magnitude(unsigned leastBits, unsigned greatestBits) {
    const uint64_t bits = between(leastBits, greatestBits);
    return between(uint64_t{1} << bits, (uint64_t{2} << bits) - 1);
  }

 private:
  std::mt19937_64 engine_;
};

void put(Bytes& bytes, uint64_t value, unsigned width) {
  for (unsigned i = 0; i < width; ++i) bytes.push_back(static_cast<char>(value >> (8 * i)));
}

void write(const std::string& path, const Bytes& bytes) {
  std::ofstream file(path, std::ios::binary);
  file.write(bytes.data(), static_cast<std::streamsize>(bytes.size()));
  if (!file.flush()) {
    std::fprintf(stderr, "cannot write %s\n", path.c_str());
    std::exit(EXIT_FAILURE);
  }
}

/// The life of one statistic: what it was when the unit was new, and what each day adds.
class Statistic {
 public:
  Statistic(Random& random, uint32_t count, unsigned greatestBits) : random_(random), values_(count) {
    if (count == 1) {
      values_[0] = random.magnitude(0, greatestBits);
      return;
    }
    // A hill with its top somewhere in the bins, and empty bins at its feet.
    const uint64_t top = random.between(0, count - 1);
    const uint64_t reach = random.between(2, count + 1);
    const uint64_t height = random.magnitude(4, greatestBits - 8);
    for (uint64_t i = 0; i < count; ++i) {
      const uint64_t away = i > top ? i - top : top - i;
      const uint64_t rise = away < reach ? reach - away : 0;
      values_[static_cast<size_t>(i)] = height * rise * rise / (reach * reach);
    }
  }

  void liveADay() {
    if (random_.between(0, 3) == 0) return;
    for (uint64_t& value : values_) value += value / random_.between(50, 400);
  }

  const std::vector<uint64_t>& values() const { return values_; }

 private:
  Random& random_;
  std::vector<uint64_t> values_;
};

/// What does not grow: the geometry of the device and the versions of what it exports.
constexpr std::pair<uint32_t, uint64_t> kConstants[] = {{1, 7},   {49, 16384}, {50, 1152},
                                                        {51, 16}, {52, 2048},  {53, 12}};

std::array<Bytes, 2> statisticsOfTwoDays(uint64_t seed) {
  Random random(seed);
  std::array<Bytes, 2> days;
  for (const ksp::KeyEntry& key : ksp::kStatsKeys) {
    Statistic statistic(random, key.count, 36);
    for (Bytes& day : days) {
      put(day, key.key, 4);
      put(day, key.count, 4);
      const auto* constant = std::find_if(std::begin(kConstants), std::end(kConstants),
                                          [&](const auto& each) { return each.first == key.key; });
      if (constant != std::end(kConstants)) {
        put(day, constant->second, 8);
        continue;
      }
      for (const uint64_t value : statistic.values()) put(day, value, 8);
      statistic.liveADay();
    }
  }
  return days;
}

std::array<Bytes, 2> mediaOfTwoDays(uint64_t seed) {
  Random random(seed);
  std::array<Bytes, 2> days;
  for (const ksp::KeyEntry& key : ksp::mspKeyTable) {
    Statistic statistic(random, key.count, key.width == 4 ? 20 : 40);
    for (Bytes& day : days) {
      put(day, key.key, 2);
      put(day, uint64_t{key.count} * key.width, 2);
      for (const uint64_t value : statistic.values()) put(day, value, key.width);
      statistic.liveADay();
    }
  }
  return days;
}

constexpr uint32_t kRecordSize = 252;
constexpr uint32_t kSnapshotRecords = 100;

/// A record every quarter of an hour: quiet at night, busy around noon.
Bytes daySnapshot(uint64_t seed) {
  Random random(seed);
  Bytes bytes;
  for (uint64_t index = 0; index < kSnapshotRecords; ++index) {
    const uint64_t half = kSnapshotRecords / 2;
    const uint64_t busy = 4 + (index < half ? index : kSnapshotRecords - index) * 2;
    std::array<uint64_t, kRecordSize / 4> words{};
    const auto load = [&](uint64_t scale) { return busy * random.between(scale / 2, scale); };
    words[0] = 1 + index * 900;
    words[1] = random.between(0, busy / 2);
    for (size_t priority = 0; priority < 4; ++priority) {
      for (const size_t triples : {size_t{2}, size_t{14}}) {
        const uint64_t operations = load(40 >> priority);
        words[triples + 3 * priority] = operations;
        words[triples + 3 * priority + 1] = operations * random.between(60, 240);
        words[triples + 3 * priority + 2] = operations == 0 ? 0 : random.between(300, 300 + 90 * busy);
      }
    }
    words[26] = load(2);
    words[27] = load(30);
    words[28] = load(20);
    words[29] = words[27] + load(4);
    words[30] = words[28] + load(10);
    words[31] = load(8);
    words[33] = random.between(0, 2);
    words[36] = random.between(0, 9);
    words[37] = random.between(0, 20);
    words[39] = load(900);
    words[40] = random.between(0, busy / 40);
    words[41] = random.between(0, busy / 20);
    words[42] = 400 - busy;
    words[43] = random.between(1, busy);
    words[44] = 10;
    words[45] = 900 - 2 * busy;
    words[47] = random.between(0, 9);
    words[48] = random.between(9, 40);
    words[50] = random.between(0, busy / 10);
    words[51] = random.between(0, busy / 50);
    words[52] = load(64);
    words[53] = 1;
    words[54] = std::min<uint64_t>(31, 2 + busy / 3);
    for (const uint64_t word : words) put(bytes, word, 4);
  }
  return bytes;
}

struct Field {
  uint16_t type;
  uint32_t word;
  uint32_t size;
  std::string_view format;
};

/// The day's records as a header describes them; the labels are the fixed report's.
constexpr Field kFields[] = {
    {0, 0, 4, "T=%04u"},   {0, 26, 4, " E=%02u"}, {0, 27, 4, " HR=%4u"},      {0, 28, 4, " HW=%4u"},
    {0, 29, 4, " NR=%4u"}, {0, 30, 4, " NW=%4u"}, {2, 39, 4, " TH=%8u.%02u"}, {0, 31, 4, " GC=%4u"},
    {0, 42, 4, " S=%4u"},  {1, 52, 4, " U=%8u"},  {3, 14, 48, " R%s="},       {3, 2, 48, " W%s="},
};

Bytes dayHeader() {
  constexpr std::string_view kTitle = "Example unit, a day in quarter hours";
  constexpr uint32_t kFixedSize = 36;
  constexpr auto kTableOffset = static_cast<uint32_t>((kFixedSize + kTitle.size() + 1 + 3) / 4 * 4);
  constexpr size_t kFormatSize = 16;
  Bytes bytes;
  for (const uint32_t word : {0U, 6U, kRecordSize, kSnapshotRecords, 0U, 0U, kTableOffset, 0U, 0U})
    put(bytes, word, 4);
  bytes.insert(bytes.end(), kTitle.begin(), kTitle.end());
  bytes.resize(kTableOffset);
  put(bytes, std::size(kFields), 4);
  put(bytes, 0, 4);
  for (const Field& field : kFields) {
    put(bytes, field.type, 2);
    put(bytes, 0, 2);
    put(bytes, uint64_t{4} * field.word, 4);
    put(bytes, field.size, 4);
    bytes.insert(bytes.end(), field.format.begin(), field.format.end());
    bytes.resize(bytes.size() + kFormatSize - field.format.size());
  }
  return bytes;
}

int usage() {
  std::fputs(
      "usage: capture_generator FOLDER [SEED]\n"
      "       capture_generator FOLDER --fleet COUNT   statistics captures only, a seed each\n",
      stderr);
  return 2;
}

}  // namespace

int main(int argc, char** argv) {
  const std::span arguments(argv, static_cast<size_t>(argc));
  if (argc < 2) return usage();
  const std::string folder = std::string(arguments[1]) + "/";
  if (argc == 4 && std::string_view(arguments[2]) == "--fleet") {
    const uint64_t count = std::strtoull(arguments[3], nullptr, 10);
    for (uint64_t unit = 0; unit < count; ++unit) {
      write(folder + "unit-" + std::to_string(100000 + unit) + ".stats", statisticsOfTwoDays(unit)[0]);
    }
    return EXIT_SUCCESS;
  }
  if (argc > 3) return usage();
  const uint64_t seed = argc == 3 ? std::strtoull(arguments[2], nullptr, 10) : kUsualSeed;
  const auto stats = statisticsOfTwoDays(seed);
  const auto media = mediaOfTwoDays(seed);
  write(folder + "monday.stats", stats[0]);
  write(folder + "tuesday.stats", stats[1]);
  write(folder + "monday.media", media[0]);
  write(folder + "tuesday.media", media[1]);
  write(folder + "day.snapshot", daySnapshot(seed));
  write(folder + "day.header", dayHeader());
  return EXIT_SUCCESS;
}
