// SPDX-License-Identifier: Apache-2.0
// What the records of a stream mean, through <ksp/records.hpp> alone.

#include "ksp/records.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <ranges>
#include <sstream>
#include <string>

#include "tests/streams.h"

namespace ksp::test {
namespace {

static_assert(std::ranges::random_access_range<Elements> && std::ranges::sized_range<Elements> &&
              std::ranges::borrowed_range<Elements> && std::ranges::view<Elements>);
static_assert(std::ranges::input_range<StatisticsRecords> && std::ranges::input_range<MediaRecords>);

/// A line a record: offset, key, name, announced of configured, what holds of it, elements; then the ending.
template <class Records>
std::string told(Records records) {
  std::ostringstream out;
  for (const Record& record : records) {
    const RecordName name = Record(record).name();
    out << record.offset << ' ' << record.key << ' ' << name.view().data() << ' ' << record.announced << '/'
        << record.configured << (record.counts ? "" : " passed-over") << (record.isArray ? " array" : "")
        << (record.isListed() ? " listed" : "") << (record.isAsConfigured() ? "" : " other-size");
    EXPECT_TRUE(record.row == nullptr ||
                (record.row->key == record.key && record.row->width == record.elements.width()));
    for (const uint64_t value : record.elements) out << ' ' << value;
    out << '\n';
  }
  constexpr const char* kReasons[] = {"not-reached", "complete", "tail", "marker", "invalid", "overrun"};
  const Ending& ending = records.ending();
  out << kReasons[static_cast<int>(ending.reason)] << ' ' << ending.offset << ' ' << ending.key << ' '
      << ending.announced << (ending.isBadHeader() ? " bad" : "") << '\n';
  return out.str();
}

template <class... Options>
std::string statistics(const std::string& text, Options... options) {
  return Stream::statistics(text).into(
      [&](const void* bytes, uint32_t length) { return told(StatisticsRecords(bytes, length, options...)); });
}

std::string media(const std::string& text) {
  return Stream::media(text).into(
      [](const void* bytes, uint32_t length) { return told(MediaRecords(bytes, length)); });
}

TEST(Records, AreToldWithWhatHoldsOfThem) {
  EXPECT_EQ(statistics("4:1234,9 298:7 900:5,6 7: 805306369: 0:3 65535:1 4:1"),
            "0 4 hostWrites 2/1 listed other-size 1234\n"
            "24 298 perHostReads 1/2 array listed other-size 7\n"
            "40 900 Stat_900 2/0 array 5 6\n"
            "64 7 hostReads 0/1 passed-over listed other-size\n"
            "72 805306369 Stat_805306369 0/0 passed-over\n"
            "80 0 Stat_0 1/0 3\n"
            "marker 96 65535 1\n");
  EXPECT_EQ(statistics("4:1234,9 298:7 805306368:18446744073709551615", StatisticsFraming::kMarked,
                       StatisticsNaming::kByNumber),
            "0 4 Stat_4 2/1 array other-size 1234 9\n"
            "24 298 Stat_298 1/2 other-size 7\n"
            "40 805306368 Stat_805306368 1/0 18446744073709551615\n"
            "complete 56 0 0\n");
  EXPECT_EQ(statistics("65535:1 805306369: 4:1", StatisticsFraming::kUnmarked),
            "0 65535 Stat_65535 1/0 1\ninvalid 16 805306369 0 bad\n");
  EXPECT_EQ(media("4096:42 4254:1 4254#3 1*1,2,3 4097: 12287: 16385:1,2,3,4,5,6 12287:0 4096:1"),
            "0 4096 passWithTmodeHard 4/4 listed 42\n"
            "8 4254 cbdr_step_3 4/40 array listed other-size 1\n"
            "16 4254 cbdr_step_3 3/40 array listed other-size\n"
            "23 4097 passWithTmodeFS1_2b 0/4 passed-over listed other-size\n"
            "27 12287 Media_12287 0/0 passed-over\n"
            "31 16385 random_read_size_ratio 48/40 array listed other-size 1 2 3 4 5\n"
            "marker 83 12287 4\n");
  // Unknown media keys have the width of their range.
  EXPECT_EQ(media("0:5 12285#15 4*1,2,3 3*9 12286:7,8 12322#23 8*1,2 7*9 65535#7 7*9"),
            "0 0 Media_0 4/0 5\n"
            "8 12285 Media_12285 15/0 array 1 2 3\n"
            "27 12286 Media_12286 8/0 passed-over\n"
            "39 12322 Media_12322 23/0 array 1 2\n"
            "66 65535 Media_65535 7/0\n"
            "complete 77 0 0\n");
}

TEST(Records, EndingsNameTheHeaderThatEndedTheStream) {
  EXPECT_EQ(statistics("1*1..7"), "tail 0 0 0\n");
  EXPECT_EQ(statistics("805306369:1"), "invalid 0 805306369 1 bad\n");
  EXPECT_EQ(statistics("4#2 8*1"), "overrun 0 4 2 bad\n");
  EXPECT_EQ(media("1*1..3"), "tail 0 0 0\n");
  EXPECT_EQ(media("12286#5 4*0"), "overrun 0 12286 5 bad\n");
  EXPECT_EQ(told(StatisticsRecords(nullptr, 64)), "complete 0 0 0\n");
  EXPECT_EQ(told(MediaRecords(nullptr, 64)), "complete 0 0 0\n");
}

TEST(Records, EachWalkBeginsAnew) {
  constexpr unsigned char kStream[] = {4, 0, 0, 0, 1, 0, 0, 0, 5, 0, 0, 0, 0, 0, 0, 0, 1};
  StatisticsRecords records(kStream, sizeof kStream);
  EXPECT_EQ(records.ending().reason, EndReason::kNotReached);
  for (int walk = 0; walk < 2; ++walk) {
    EXPECT_EQ(std::ranges::distance(records.begin(), records.end()), 1);
    EXPECT_EQ(records.ending().reason, EndReason::kTail);
  }
  const auto first = records.begin();
  EXPECT_EQ(first->elements[0], 5U);
  EXPECT_EQ(records.ending().reason, EndReason::kNotReached);
}

TEST(Records, ElementsAreARandomAccessRange) {
  constexpr unsigned char kBytes[] = {1, 0, 0, 3, 0, 0, 5, 1, 0, 255, 255, 255};
  const Elements elements(kBytes, 3, 4);
  const auto begin = elements.begin();
  const auto end = elements.end();
  EXPECT_EQ(end - begin, 4);
  EXPECT_EQ(begin[2], 261U);
  EXPECT_EQ(*(end - 1), 0xFFFFFFU);
  EXPECT_EQ(*--(2 + begin), 3U);
  EXPECT_LT(begin, end);
  EXPECT_EQ(std::ranges::lower_bound(elements, 4U) - begin, 2);
  EXPECT_TRUE(elements.size() == 4 && elements.width() == 3 && !elements.empty());
  EXPECT_TRUE(Elements().empty() && Elements().begin() == Elements().end());
}

}  // namespace
}  // namespace ksp::test
