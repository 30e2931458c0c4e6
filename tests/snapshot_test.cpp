// SPDX-License-Identifier: Apache-2.0
#include "ksp/snapshot.h"

#include <gtest/gtest.h>
#include <sys/time.h>

#include <array>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "snapshot/header.h"
#include "tests/plain_snapshot.h"

static uint64_t allocations = 0;
#ifndef KSP_SANITIZED  // a sanitizer brings a heap of its own
extern "C" void* __libc_malloc(size_t size);
extern "C" [[gnu::visibility("default")]] void* malloc(size_t size) {
  ++allocations;
  return __libc_malloc(size);
}
#endif

static suseconds_t microseconds = 7999;
extern "C" int __wrap_gettimeofday(timeval* now, void* /*zone*/) {
  *now = {.tv_sec = 1772317805, .tv_usec = microseconds};
  return 0;
}

namespace ksp::test {
namespace {

constexpr std::string_view kCaptureLine = "Captured at: 2026-02-28 22:30:05.007\n";
// Without a zone the C library copies its default one's name at each look.
const bool kZoneIsSet = setenv("TZ", "UTC0", 1) == 0 && (tzset(), true);
constexpr char kUntouched = '\x5A';
const std::string kHeading = "- KSP Snapshot - \n%u #3%%\n";

std::string words(const std::vector<uint32_t>& values) {
  std::string bytes;
  for (const uint32_t value : values) {
    for (const int shift : {0, 8, 16, 24}) bytes += static_cast<char>(value >> shift);
  }
  return bytes;
}

// A header whose records begin with the only field that is printed, a plain number: the next one is of no
// known type, and the last two lie outside.
std::string makeHeader(uint32_t recordSize, uint32_t recordCount) {
  const std::string title("%u #3%%\0", 8);
  const std::string number("%u\0\0\0\0\0\0\0\0\0\0\0\0\0\0", 16);
  return words({0, 0x80000006, recordSize, recordCount, 0, 0, 44, 0, 0}) + title + words({4, 0, 0, 0, 4}) +
         number + words({0x100, 0, 4}) + number + words({0, 0x10000, 4}) + number + words({3, 0, 0x10000}) +
         std::string("%s").append(14, '\0');
}

struct Outcome {
  uint64_t size = 0;
  uint32_t cursor = 0;
  /// All of it, with some bytes behind its capacity.
  std::string buffer = std::string(static_cast<size_t>(size) + 64, kUntouched);
  int result = 0;
  uint64_t allocated = 0;

  template <class Renderer, class... Arguments>
  void render(Renderer renderer, const std::string& records, Arguments... arguments) {
    const uint64_t before = allocations;
    result = renderer(records.data(), records.size(), buffer.data(), &size, arguments...);
    allocated = allocations - before;
  }

  std::string text() const { return buffer.substr(0, buffer.find('\0')); }
};

// Renders a report that is to be the plain one, bytes behind its end included.
Outcome report(const std::string& records, uint64_t capacity) {
  Outcome outcome{capacity};
  Outcome expected{capacity};
  outcome.render(KSPParseSnapshotBuffer, records);
  expected.render(plainReport, records);
  EXPECT_EQ(outcome.result, expected.result) << capacity;
  EXPECT_EQ(outcome.size, expected.size) << capacity;
  EXPECT_EQ(outcome.buffer, expected.buffer) << capacity;
  return outcome;
}

// Renders a page that is to be the plain one; behind its capacity nothing is written.
Outcome page(const std::string& header, const std::string& records, uint64_t capacity, uint32_t cursor = 0) {
  Outcome outcome{capacity, cursor};
  outcome.render(KSPParseSnapshotBufferWithInplaceParser, records, header.data(), &outcome.cursor);
  const auto bytesOf = [](const std::string& text) {
    return reinterpret_cast<const unsigned char*>(text.data());
  };
  const PlainPage expected =
      plainPage(bytesOf(records), records.size(), capacity, bytesOf(header), cursor, kCaptureLine);
  SCOPED_TRACE(testing::Message() << capacity << " bytes from record " << cursor);
  EXPECT_EQ(outcome.result, expected.result);
  EXPECT_EQ(outcome.cursor, expected.cursor);
  EXPECT_EQ(outcome.size, expected.text.size() + 1);
  EXPECT_EQ(outcome.text(), capacity == 0 ? outcome.buffer : expected.text);
  EXPECT_EQ(outcome.buffer.find_first_not_of(kUntouched, static_cast<size_t>(capacity)), std::string::npos);
  return outcome;
}

std::string read(const std::filesystem::path& file) {
  std::ostringstream bytes;
  bytes << std::ifstream(file, std::ios::binary).rdbuf();
  return bytes.str();
}

// NAME.txt is what NAME.records show, and with a NAME.header the page that they make, below its first line.
TEST(Snapshot, RendersEachCaptureWithoutAllocating) {
  ASSERT_TRUE(kZoneIsSet);
  size_t captures = 0;
  for (const auto& entry : std::filesystem::recursive_directory_iterator(KSP_TEST_DATA "/snapshot")) {
    std::filesystem::path file = entry.path();
    if (file.extension() != ".records") continue;
    SCOPED_TRACE(file);
    ++captures;
    const std::string records = read(file);
    const std::string expected = read(file.replace_extension(".txt"));
    const bool paged = std::filesystem::exists(file.replace_extension(".header"));
    const std::string header = paged ? read(file) : "";
    const Outcome outcome = paged ? page(header, records, 1 << 16) : report(records, 1 << 16);
    EXPECT_EQ(outcome.result, 1);
    EXPECT_EQ(outcome.text(), paged && !expected.empty() ? std::string(kCaptureLine) + expected : expected);
    EXPECT_EQ(outcome.allocated, 0U);
    for (uint64_t capacity = 0; capacity <= outcome.size + 1 && !testing::Test::HasFailure(); ++capacity) {
      if (paged) {
        page(header, records, capacity);
        page(header, records, capacity, 1);
      } else {
        report(records, capacity);
      }
    }
  }
  EXPECT_GE(captures, 14U);
#ifndef KSP_SANITIZED
  EXPECT_GT(allocations, 0U);
#endif
}

TEST(Snapshot, PageShowsTheLocalTimeOfItsRendering) {
  const std::string header = makeHeader(4, 2);
  const std::string records = words({1, 1});
  for (const auto& [zone, fraction, local] : {std::tuple{"AAA-5:30", 500499, "2026-03-01 04:00:05.500"},
                                              {"BBB+11", 999, "2026-02-28 11:30:05.000"}}) {
    setenv("TZ", zone, 1);
    microseconds = fraction;
    Outcome outcome{200};
    outcome.render(KSPParseSnapshotBufferWithInplaceParser, records, header.data(), &outcome.cursor);
    EXPECT_TRUE(outcome.text().starts_with(std::string("Captured at: ") + local + "\n"));
  }
  setenv("TZ", "UTC0", 1);
  microseconds = 7999;
}

// Taking the cursor back for the line that did not fit, a caller gets every record once.
TEST(Snapshot, PagesOfAnyCapacityHoldEveryRecord) {
  const std::string records = words({1, 22, 333, 0, 4444, 55555, 0, 0, 666666, 7777777, 8, 9});
  const std::string header = makeHeader(4, 12);
  for (uint64_t capacity = 0; capacity < 140; ++capacity) {
    std::string paged;
    uint32_t start = 0;
    for (Outcome outcome; outcome.result == 0; start = outcome.cursor - (outcome.result == 0 ? 1 : 0)) {
      outcome = page(header, records, capacity, start);
      if (outcome.size == 1) break;
      paged += outcome.text().substr(kCaptureLine.size());
    }
    if (capacity > kCaptureLine.size() + kHeading.size() + 8) {
      ASSERT_EQ(paged, kHeading + "1\n22\n333\n4444\n55555\n666666\n7777777\n8\n") << capacity;
    }
    page(header, records, capacity, 12);
    page(makeHeader(4, 1), records, capacity);
  }
}

TEST(Snapshot, WalkEndsWithTheRecordsWhateverTheHeaderClaims) {
  constexpr uint32_t kMost = 0xFFFFFFFF;
  using Row = std::array<uint32_t, 4>;  // record size, record count, the cursor before and after
  for (const auto& [recordSize, recordCount, start, end] : {Row{4, 0, 0, 0},
                                                            {4, 1, 0, 0},
                                                            {4, 4, 0, 3},
                                                            {4, 4, 9, 9},
                                                            {4, kMost, 0, 4},
                                                            {12, kMost, 0, 1},
                                                            {17, kMost, 0, 0},
                                                            {kMost, kMost, 0, 0},
                                                            {1U << 31, kMost, 2, 2},
                                                            {0, kMost, 0, kMost - 1}}) {
    const Outcome outcome = page(makeHeader(recordSize, recordCount), words({1, 2, 3, 4}), 1000, start);
    EXPECT_EQ(outcome.result, 1);
    EXPECT_EQ(outcome.cursor, end) << recordSize << ' ' << recordCount;
  }
}

TEST(Snapshot, PageWithoutHeaderLeavesEverythingUntouched) {
  Outcome outcome{3, 7};
  outcome.render(KSPParseSnapshotBufferWithInplaceParser, "", nullptr, &outcome.cursor);
  EXPECT_TRUE(outcome.result == 0 && outcome.size == 3 && outcome.cursor == 7);
  EXPECT_EQ(outcome.buffer.find_first_not_of(kUntouched), std::string::npos);
}

TEST(Snapshot, HeaderIsCheckedAgainstTheSizeOfItsFile) {
  const std::string whole = makeHeader(4, 9);
  const std::string untitled = words({0, 5, 4, 9, 0, 0, 0, 0, 0});
  for (const auto& [header, fault] : {
           std::pair<std::string, const char*>{whole, nullptr},
           {untitled, nullptr},
           {whole.substr(0, 35), "is shorter than its fixed 36 bytes"},
           {whole.substr(0, 43), "has a title without an end"},
           {whole.substr(0, 51), "has its descriptor table behind its end"},
           {std::string(whole).replace(24, 4, 4, '\xFF'), "has its descriptor table behind its end"},
           {whole.substr(0, whole.size() - 1), "counts more descriptors than it holds"},
       }) {
    const std::vector<char> exact(header.begin(), header.end());
    EXPECT_STREQ(snapshotHeaderFault(exact.data(), exact.size()), fault);
  }
}

}  // namespace
}  // namespace ksp::test
