// SPDX-License-Identifier: Apache-2.0
// What the parsers allocate, and what becomes of a context when an allocation fails.

#include <gtest/gtest.h>

#include <cstring>

#include "ksp/error.h"
#include "ksp/media_statistics.h"
#include "ksp/statistics.h"
#include "tests/context_check.h"
#include "tests/streams.h"

namespace {

// Of the library: its calls, blocks that it holds, and the number of the call that gets nothing.
int calls = 0;
int held = 0;
int failing = -1;

}  // namespace

extern "C" {
void* __real_malloc(size_t size);
void __real_free(void* memory);

void* __wrap_malloc(size_t size) {
  if (calls++ == failing) return nullptr;
  ++held;
  void* const memory = __real_malloc(size);
  return memory == nullptr ? memory : std::memset(memory, 0xA5, size);
}
void* __wrap_calloc(size_t count, size_t size) {
  void* const memory = __wrap_malloc(count * size);
  return memory == nullptr ? memory : std::memset(memory, 0, count * size);
}
void __wrap_free(void* memory) {
  if (memory != nullptr) --held;
  __real_free(memory);
}
}

namespace ksp::test {
namespace {

constexpr int kEntries = 12;  // a single, an array of ten, a single
const Stream kStatistics = Stream::statistics("4:1 14:1..10 7:2");
const Stream kMedia = Stream::media("4096:1 4254:1..10 4097:1");

class Allocation : public testing::Test {
 protected:
  // From now on a failure is not the first, and its message allocates nothing.
  static void SetUpTestSuite() { SetAPIErrorMessage("first"); }
  void SetUp() override { expectFailure(-1); }
  void TearDown() override { EXPECT_EQ(held, 0) << "blocks that were never freed"; }

  static void expectFailure(int number) {
    calls = held = 0;
    failing = number;
  }

  // Parses with each allocation failing in turn. `expected` gives result and entries by the number of the
  // entry that lacks memory.
  template <class Owner, class Parse, class Expected>
  static void failEach(const Stream& stream, Parse parse, Expected expected) {
    for (int number = 0; number < 2 * kEntries; ++number) {
      SCOPED_TRACE(number);
      expectFailure(number);
      Owner context;
      const auto [result, entries] = expected(number / 2);
      EXPECT_EQ(static_cast<int>(stream.into(parse, context.get())), result);
      EXPECT_EQ(std::ranges::distance(ksp::entries(context)), entries);
      const std::string found = textOf(context);
      EXPECT_EQ(held, 2 * entries);
      failing = -1;
      ASSERT_EQ(AddSingleValueToGenericContext(&listsOf(*context.get()), "", "next", 1), 1);
      EXPECT_EQ(textOf(context), found.empty() ? "next=1" : found + " next=1");
      context.reset();
      EXPECT_EQ(held, 0);
    }
  }
};

TEST_F(Allocation, GenericNodesAreZeroBehindTheirText) {
  GenericContext context;
  kStatistics.into(KSPFTLParseBufferToCxt, context.get());
  EXPECT_EQ(AddSingleValueToGenericContext(context.get(), std::string(98, 'n').c_str(), "", 1), 1);
  EXPECT_EQ(requireSound(*context), kEntries + 1U);
}

TEST_F(Allocation, GenericParserGoesOnUnlessAnArrayLacksMemory) {
  failEach<GenericContext>(kStatistics, KSPFTLParseBufferToCxt, [](int entry) {
    const bool inArray = entry > 0 && entry < kEntries - 1;
    return inArray ? std::pair(1, 10) : std::pair(kEntries, kEntries - 1);
  });
}

TEST_F(Allocation, MediaParserEndsAtTheRecordThatLacksMemory) {
  failEach<GenericContext>(kMedia, KSPMSPParseBufferToCxt, [](int entry) {
    if (entry == 0) return std::pair(0, 0);
    return entry < kEntries - 1 ? std::pair(1, 10) : std::pair(11, 11);
  });
}

TEST_F(Allocation, LegacyParserLeavesOutWhatLacksMemory) {
  failEach<LegacyContext>(kStatistics, KSPParseBufferToCxt, [](int) { return std::pair(1, kEntries - 1); });
  for (const char* text : {"4:6", "265:5,6,7,8,9"}) {
    expectFailure(0);
    LegacyContext context;
    EXPECT_EQ(Stream::statistics(text).into(KSPParseBufferToCxt, context.get()), 1);
    EXPECT_EQ(context->hostWrites + context->readCountHisto[4], text[0] == '4' ? 6U : 9U)
        << "the summary has it";
    failing = -1;
  }
}

}  // namespace
}  // namespace ksp::test
