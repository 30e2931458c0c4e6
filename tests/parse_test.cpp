// SPDX-License-Identifier: Apache-2.0
// Holds the parsers against parse_cases.txt and against the plain ones.

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <fstream>
#include <random>
#include <utility>

#include "ksp/error.h"
#include "ksp/media_statistics.h"
#include "ksp/records.hpp"
#include "ksp/statistics.h"
#include "tests/context_check.h"
#include "tests/plain_parsers.h"
#include "tests/streams.h"

namespace {
bool storeHasMemory = true;
}

extern "C" void* __real_calloc(size_t count, size_t size);
extern "C" void* __wrap_calloc(size_t count, size_t size) {
  return storeHasMemory ? __real_calloc(count, size) : nullptr;
}

namespace ksp::test {
namespace {

// Returns the message that was left, and empties the store for the next case.
std::string takeMessage() {
  std::string message = GetAPIErrorMessage();
  std::free(std::exchange(GlobalAPIErrorMessage, nullptr));
  return message;
}

template <class Owner, class Parse>
std::string outcome(const Stream& stream, Parse parse, bool lost) {
  Owner context;
  const auto result = stream.into(parse, lost ? nullptr : context.get());
  requireSound(listsOf(*context.get()));
  return std::to_string(result) + " " + textOf(context);
}

template <class Records>
std::string walked(Records records) {
  constexpr const char* kReasons[] = {"", "complete", "tail", "marker", "invalid", "overrun"};
  std::ranges::for_each(records, [](const Record&) {});
  const Ending& ending = records.ending();
  return std::to_string(ending.offset) + " " + kReasons[static_cast<int>(ending.reason)];
}

std::string run(const std::string& parser, const std::string& kind, const std::string& text) {
  const bool lost = parser.ends_with("-lost");
  const bool isMedia = kind == "media";
  const Stream stream = isMedia ? Stream::media(text) : Stream::statistics(text);
  if (parser.starts_with("generic")) return outcome<GenericContext>(stream, KSPFTLParseBufferToCxt, lost);
  if (parser.starts_with("number"))
    return outcome<GenericContext>(stream, KSPFTLParseStatKeyBufferToCxt, lost);
  if (parser.starts_with("legacy")) return outcome<LegacyContext>(stream, KSPParseBufferToCxt, lost);
  if (parser.starts_with("media")) return outcome<GenericContext>(stream, KSPMSPParseBufferToCxt, lost);
  const auto walk = [&](const void* bytes, uint32_t length) {
    return isMedia ? walked(MediaRecords(bytes, length)) : walked(StatisticsRecords(bytes, length));
  };
  return parser == "walk" ? stream.into(walk) : "no parser has this name";
}

TEST(Parse, Cases) {
  std::ifstream file(KSP_PARSE_CASES);
  std::string what, kind, stream, parser, expected, message;
  int checked = 0;
  const auto check = [&] {
    if (parser.empty()) return;
    SCOPED_TRACE(what + ", " + parser);
    EXPECT_EQ(run(parser, kind, stream), expected);
    EXPECT_EQ(takeMessage(), message);
    parser.clear();
    ++checked;
  };
  for (std::string line; std::getline(file, line);) {
    const std::string word = line.substr(0, line.find(' '));
    const std::string rest = line.substr(std::min(word.size() + 1, line.size()));
    if (word == "says") {
      message = rest;
      continue;
    }
    check();
    if (word.empty() || word == "#") continue;
    if (word == "case") {
      what = rest;
      kind.clear();
    } else if (kind.empty()) {
      kind = word;
      stream = rest;
    } else {
      parser = word;
      const std::string entries = expanded(rest.substr(std::min(rest.find(' '), rest.size())));
      expected = rest.substr(0, rest.find(' ')) + " " + entries;
      message = "NA";
    }
  }
  check();
  EXPECT_GT(checked, 90) << "cases were lost";
}

TEST(Parse, NullStreams) {
  const auto emptyFor = [](auto parse, auto context) { return parse(context.get(), nullptr, 16); };
  EXPECT_EQ(emptyFor(KSPFTLParseBufferToCxt, GenericContext()), 0U);
  EXPECT_EQ(emptyFor(KSPParseBufferToCxt, LegacyContext()), 0);
  EXPECT_EQ(takeMessage(), "NA");
  EXPECT_EQ(emptyFor(KSPMSPParseBufferToCxt, GenericContext()), 0U);
  EXPECT_EQ(takeMessage(), "KSPMSPParseBufferToCxt: Passed in invalid buffer or empty buffer");
}

template <class Owner, class Parse, class Plain>
void expectAgreement(const Stream& stream, Parse parse, Plain plain) {
  const auto compare = [=](const unsigned char* bytes, uint32_t length) {
    return agrees<Owner>(parse, plain, bytes, length);
  };
  EXPECT_TRUE(stream.into(compare));
}

// Streams of every key, then of keys, counts and ends as they fall.
TEST(Parse, AgreesWithThePlainParsers) {
  const auto check = [](const std::string& text) {
    SCOPED_TRACE(text);
    const Stream statistics = Stream::statistics(text);
    expectAgreement<GenericContext>(statistics, KSPFTLParseBufferToCxt, plainGeneric);
    expectAgreement<GenericContext>(statistics, KSPFTLParseStatKeyBufferToCxt, plainStatKey);
    expectAgreement<LegacyContext>(statistics, KSPParseBufferToCxt, plainLegacy);
    expectAgreement<GenericContext>(Stream::media(text), KSPMSPParseBufferToCxt, plainMedia);
  };
  std::mt19937 random(1);  // NOLINT(cert-msc32-c,cert-msc51-cpp): the same streams in each run
  const auto record = [&](uint64_t key, uint64_t count) {
    const uint64_t first = random() * (uint64_t{random()} + 1) / 2;
    std::string text = std::to_string(key);
    text += count == 0 ? ":" : ":" + std::to_string(first) + ".." + std::to_string(first + count - 1);
    return text + " ";
  };
  std::string statistics, media;
  for (const auto& row : kStatsKeys) statistics += record(row.key, row.count);
  for (const auto& row : mspKeyTable) media += record(row.key, row.count);
  check(statistics);
  check(media);
  for (int round = 0; round < 3000; ++round) {
    std::string text;
    for (auto left = random() % 6; left > 0; --left) {
      const auto& statistic = kStatsKeys[random() % std::size(kStatsKeys)];
      const auto& medium = mspKeyTable[random() % std::size(mspKeyTable)];
      const uint64_t keys[] = {statistic.key, medium.key, statistic.key + 65536U,    random() % 900,
                               random(),      0x1FFFF,    0x30000000 + random() % 2, 0xFFFF,
                               0x2FFE,        0x2FFF};
      const uint64_t counts[] = {statistic.count, medium.count, random() % 12, 1};
      text += record(keys[random() % std::size(keys)], counts[random() % std::size(counts)]);
      if (random() % 9 == 0) text += std::to_string(keys[0]) + "#" + std::to_string(random() % 9) + " ";
      if (random() % 9 == 0) text += "1*1.." + std::to_string(random() % 9 + 1) + " ";
    }
    check(text);
  }
}

TEST(Statistics, OnlyBadHeadersTakeBackTheVersion) {
  LegacyContext context;
  const auto versionAfter = [&](const std::string& text) {
    Stream::statistics(text).into(KSPParseBufferToCxt, context.get());
    return context->exportVersion;
  };
  EXPECT_EQ(versionAfter("53:7 4:2"), 7U);
  EXPECT_EQ(versionAfter("4:3"), 7U);
  EXPECT_EQ(versionAfter("1*1..7"), 7U) << "no word";
  EXPECT_EQ(versionAfter("53:8 1#1"), 0U);
  EXPECT_EQ(context->hostWrites, 3U);
}

uint64_t fnv1a(const std::string& text) {
  uint64_t sum = 0xCBF29CE484222325;
  for (const char each : text) sum = (sum ^ static_cast<unsigned char>(each)) * 0x100000001B3;
  return sum;
}

TEST(KeyTables, HoldEveryKeyNameAndCount) {
  std::string statistics, media;
  for (const auto& row : kStatsKeys) {
    statistics += std::to_string(row.key) + " " + row.name.data() + " " + std::to_string(row.count) + "\n";
  }
  for (const auto& row : mspKeyTable) {
    media += std::to_string(row.key) + " " + row.name.data() + " " + std::to_string(row.count) + " " +
             std::to_string(row.width) + "\n";
  }
  EXPECT_EQ(fnv1a(statistics), 0x7AF83B696C8ECAAEU);
  EXPECT_EQ(fnv1a(media), 0xFE552B23E0AF8FBFU);
}

TEST(Message, TheFirstOneStays) {
  takeMessage();
  storeHasMemory = false;
  SetAPIErrorMessage("lost");
  EXPECT_STREQ(GetAPIErrorMessage(), "NA");
  storeHasMemory = true;
  SetAPIErrorMessage("%s", std::string(2000, 'x').c_str());
  SetAPIErrorMessage("second");
  EXPECT_EQ(takeMessage(), std::string(1023, 'x'));
}

}  // namespace
}  // namespace ksp::test
