// What the parsers allocate, and what becomes of a context when an allocation fails.

#include <gtest/gtest.h>

#include <cstring>

#include "ksp/error.h"
#include "ksp/media_statistics.h"
#include "ksp/statistics.h"
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
const Stream kStatistics = Stream().stat(4, {1}).stat(14, countUp(10)).stat(7, {2});
const Stream kMedia = Stream().media(4096, 4).media(4254, 40).media(4097, 4);

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
      EXPECT_EQ(static_cast<int>(stream.run(parse, context.get())), result);
      const Entries found = entriesOf(context);
      EXPECT_EQ(static_cast<int>(found.size()), entries);
      EXPECT_EQ(held, 2 * entries);
      failing = -1;
      ASSERT_EQ(AddSingleValueToGenericContext(lists(*context.get()), "", "next0", 1), 1);
      EXPECT_EQ(entriesOf(context), found + numbered("next", 1));
      context.reset();
      EXPECT_EQ(held, 0);
    }
  }

  static GenericParserContext* lists(GenericParserContext& context) { return &context; }
  static GenericParserContext* lists(KSPParseContext& context) { return &context.entries; }
};

TEST_F(Allocation, TwoForEachEntry) {
  GenericContext generic;
  LegacyContext legacy;
  GenericContext media;
  kStatistics.run(KSPFTLParseBufferToCxt, generic.get());
  EXPECT_EQ(calls, 2 * kEntries);
  kStatistics.run(KSPParseBufferToCxt, legacy.get());
  EXPECT_EQ(calls, 4 * kEntries);
  kMedia.run(KSPMSPParseBufferToCxt, media.get());
  EXPECT_EQ(calls, 6 * kEntries);
}

TEST_F(Allocation, GenericNodesAreZeroBehindTheirText) {
  GenericContext context;
  const std::string longest(98, 'n');
  AddSingleValueToGenericContext(context.get(), longest.c_str(), "", 1);
  AddSingleValueToGenericContext(context.get(), "n", "", ~uint64_t{0});
  kStatistics.run(KSPFTLParseBufferToCxt, context.get());
  for (const NameValueNode* list : {context->nameHead, context->valueHead}) {
    for (const NameValueNode* node = list; node != nullptr; node = node->next) {
      const std::string_view text(node->text, sizeof node->text);
      EXPECT_EQ(text.find_first_not_of('\0', text.find('\0')), text.npos);
      EXPECT_TRUE(list == context->valueHead || node->value == 0);
    }
  }
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
  expectFailure(0);
  LegacyContext context;
  EXPECT_EQ(Stream().stat(4, {6}).run(KSPParseBufferToCxt, context.get()), 1);
  EXPECT_TRUE(entries(context).empty());
  EXPECT_EQ(context->hostWrites, 6U) << "the summary has it all the same";
}

}  // namespace
}  // namespace ksp::test
