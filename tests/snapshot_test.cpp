#include "ksp/snapshot.h"

#include <gtest/gtest.h>

#include <array>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "bench/plain_report.h"
#include "snapshot/header.h"

static uint64_t allocations = 0;
#ifndef KSP_SANITIZED  // a sanitizer brings a heap of its own
extern "C" void* __libc_malloc(size_t size);
extern "C" void* malloc(size_t size) {
  ++allocations;
  return __libc_malloc(size);
}
#endif

namespace {

constexpr size_t kCaptureLine = std::string_view("Captured at: 2026-11-16 17:30:05.007\n").size();
constexpr char kUntouched = '\x5A';
const std::string kHeading = "- KSP Snapshot - \nUnit #3\n";

std::string words(const std::vector<uint32_t>& values) {
  std::string bytes;
  for (const uint32_t value : values) {
    for (const int shift : {0, 8, 16, 24}) bytes += static_cast<char>(value >> shift);
  }
  return bytes;
}

// A header whose records begin with the only field, printed as a plain number.
std::string makeHeader(uint32_t recordSize, uint32_t recordCount) {
  const std::string title("Unit #3\0", 8);
  const std::string format("%u\0\0\0\0\0\0\0\0\0\0\0\0\0\0", 16);
  return words({0, 6, recordSize, recordCount, 0, 0, 44, 0, 0}) + title + words({1, 0, 0, 0, 4}) + format;
}

struct Outcome {
  int result = 0;
  uint64_t size = 0;
  uint32_t cursor = 0;
  uint64_t allocated = 0;
  std::string buffer;  // all of it, with some bytes behind its capacity

  std::string text() const { return buffer.substr(0, buffer.find('\0')); }
  std::string lines() const { return text().substr(text().find('\n') + 1); }
};

template <class Renderer>
Outcome render(uint64_t capacity, uint32_t cursor, Renderer renderer) {
  Outcome outcome{0, capacity, cursor, 0, std::string(capacity + 64, kUntouched)};
  const uint64_t before = allocations;
  outcome.result = renderer(outcome.buffer.data(), &outcome.size, &outcome.cursor);
  outcome.allocated = allocations - before;
  return outcome;
}

Outcome report(const std::string& records, uint64_t capacity,
               decltype(KSPParseSnapshotBuffer)* renderer = KSPParseSnapshotBuffer) {
  return render(capacity, 0, [&](char* out, uint64_t* size, uint32_t* /*cursor*/) {
    return renderer(records.data(), records.size(), out, size);
  });
}

Outcome page(const std::string& header, const std::string& records, uint64_t capacity, uint32_t cursor = 0) {
  return render(capacity, cursor, [&](char* out, uint64_t* size, uint32_t* next) {
    return KSPParseSnapshotBufferWithInplaceParser(records.data(), records.size(), out, size, header.data(),
                                                   next);
  });
}

std::string read(const std::filesystem::path& file) {
  std::ostringstream bytes;
  bytes << std::ifstream(file, std::ios::binary).rdbuf();
  return bytes.str();
}

// NAME.txt is what NAME.records show, and with a NAME.header the page that they make, below its first line.
TEST(Snapshot, RendersEachCaptureWithoutAllocating) {
  setenv("TZ", "UTC0", 1);  // without it the C library copies its default zone's name at each look
  tzset();
  size_t captures = 0;
  for (const auto& entry : std::filesystem::recursive_directory_iterator(KSP_TEST_DATA "/snapshot")) {
    std::filesystem::path file = entry.path();
    if (file.extension() != ".records") continue;
    SCOPED_TRACE(file);
    ++captures;
    const std::string records = read(file);
    const std::string expected = read(file.replace_extension(".txt"));
    const bool paged = std::filesystem::exists(file.replace_extension(".header"));
    const Outcome outcome = paged ? page(read(file), records, 1 << 16) : report(records, 1 << 16);
    EXPECT_EQ(outcome.result, 1);
    EXPECT_EQ(paged ? outcome.lines() : outcome.text(), expected);
    EXPECT_EQ(outcome.size, outcome.text().size() + (paged ? 1 : 0));
    EXPECT_EQ(outcome.allocated, 0U);
  }
  EXPECT_GE(captures, 14U);
#ifndef KSP_SANITIZED
  EXPECT_GT(allocations, 0U);
#endif
}

TEST(Snapshot, ReportIsCutAsPiecesOfSnprintfWouldBeAtEveryCapacity) {
  std::vector<uint32_t> values(126);
  for (uint32_t i = 0; i < values.size(); ++i) values[i] = i % 3 == 0 ? 0xFFFFFFFF >> i % 32 : i;
  const std::string records = words(values);
  const uint64_t whole = report(records, 1 << 16).size;
  for (uint64_t capacity = 0; capacity <= whole + 1; ++capacity) {
    const Outcome expected = report(records, capacity, plainReport);
    const Outcome outcome = report(records, capacity);
    ASSERT_EQ(outcome.result, capacity > whole ? 1 : 0) << capacity;
    ASSERT_EQ(outcome.size, expected.size) << capacity;
    ASSERT_EQ(outcome.buffer, expected.buffer) << capacity;
  }
}

TEST(Snapshot, PageShowsTheLocalTimeOfItsRendering) {
  for (const auto& [zone, offset] : {std::pair{"AAA-5:30", 19800}, {"BBB+11", -39600}}) {
    setenv("TZ", zone, 1);
    const auto now = [shift = offset](const char* fraction) {
      const time_t there = time(nullptr) + shift;
      char text[64];
      return std::string(text, strftime(text, sizeof text, "Captured at: %F %T", gmtime(&there))) + fraction;
    };
    const std::string before = now(".000\n");
    const std::string line = page(makeHeader(4, 2), words({1, 1}), 100).text().substr(0, kCaptureLine);
    EXPECT_GE(line, before);
    EXPECT_LE(line, now(".999\n"));
    EXPECT_EQ(line.find_first_not_of("0123456789", line.find('.') + 1), kCaptureLine - 1);
  }
}

TEST(Snapshot, PageKeepsWholeLinesAtEveryCapacity) {
  const std::vector<uint32_t> keys = {1, 22, 333, 0, 4444, 55555, 0, 0, 666666, 7777777, 8, 9};
  for (uint64_t capacity = 0; capacity < 140; ++capacity) {
    std::string paged;
    uint32_t start = 0;
    for (Outcome outcome; outcome.result == 0; start = outcome.cursor - (outcome.result == 0 ? 1 : 0)) {
      SCOPED_TRACE(testing::Message() << capacity << " bytes from record " << start);
      const std::string heading = start == 0 ? kHeading : "";
      uint64_t length = kCaptureLine + heading.size();
      bool fits = length < capacity;
      std::string expected;
      uint32_t cursor = start;
      while (fits && cursor + 1 < keys.size()) {
        const std::string line = keys[cursor] == 0 ? "" : std::to_string(keys[cursor]) + "\n";
        fits = (length += line.size()) < capacity;
        if (fits) expected += line;
        ++cursor;
      }
      outcome = page(makeHeader(4, 12), words(keys), capacity, start);
      ASSERT_EQ(outcome.result, fits ? 1 : 0);
      ASSERT_EQ(outcome.cursor, cursor);
      ASSERT_EQ(outcome.size, expected.empty() ? 1 : kCaptureLine + heading.size() + expected.size() + 1);
      ASSERT_EQ(outcome.buffer.find_first_not_of(kUntouched, capacity), std::string::npos);
      ASSERT_EQ(outcome.lines(), capacity == 0 ? outcome.buffer : expected.empty() ? "" : heading + expected);
      if (expected.empty()) break;
      paged += outcome.lines();
    }
    // Taking the cursor back for the line that did not fit, a caller gets every record once.
    if (capacity > kCaptureLine + kHeading.size() + 8) {
      ASSERT_EQ(paged, kHeading + "1\n22\n333\n4444\n55555\n666666\n7777777\n8\n") << capacity;
    }
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
  uint64_t size = 3;
  uint32_t cursor = 7;
  EXPECT_EQ(KSPParseSnapshotBufferWithInplaceParser("", 0, nullptr, &size, nullptr, &cursor), 0);
  EXPECT_EQ(size, 3U);
  EXPECT_EQ(cursor, 7U);
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
    EXPECT_STREQ(ksp::snapshotHeaderFault(exact.data(), exact.size()), fault);
  }
}

}  // namespace
