#include "ksp/context.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "ksp/numbers.h"
#include "tests/streams.h"

namespace ksp::test {
namespace {

TEST(Context, NamesAreCutAt98Characters) {
  const std::string longText(120, 'n');
  const struct {
    std::string prefix;
    std::string name;
  } cases[] = {{"", ""},        {"a", "b"},      {longText.substr(0, 60), longText.substr(0, 60)},
               {longText, "x"}, {"x", longText}, {longText.substr(0, 98), "x"}};
  GenericContext context;
  Entries expected;
  for (const auto& c : cases) {
    EXPECT_EQ(AddSingleValueToGenericContext(context.get(), c.prefix.c_str(), c.name.c_str(), 7), 1);
    expected.push_back({(c.prefix + c.name).substr(0, 98), 7});
  }
  const unsigned char elements[12] = {};
  for (const size_t length : {74U, 90U, 96U, 97U, 98U, 99U}) {
    const std::string stem = longText.substr(0, length);
    EXPECT_EQ(AddMultipleFieldsToGenericContext(context.get(), stem.c_str(), elements, 1, 12), 1);
    for (int i = 0; i < 12; ++i) expected.push_back({(stem + std::to_string(i)).substr(0, 98), 0});
  }
  EXPECT_EQ(entriesOf(context), expected);
}

TEST(Context, ValuesAreWrittenOutInDecimal) {
  GenericContext context;
  std::vector<uint64_t> values = {0, ~uint64_t{0}};
  for (uint64_t power = 1, i = 0; i < 20; ++i, power *= 10) {
    for (const uint64_t value : {power - 1, power, power + 1, power / 9 * 7}) values.push_back(value);
  }
  for (const uint64_t value : values) AddSingleValueToGenericContext(context.get(), "", "v", value);
  const NameValueNode* node = context->valueHead;
  for (const uint64_t value : values) {
    ASSERT_NE(node, nullptr);
    EXPECT_EQ(node->text, std::to_string(value));
    EXPECT_EQ(node->value, value);
    node = node->next;
  }
}

TEST(Context, ElementsOfEveryWidthAreLittleEndian) {
  const unsigned char source[17] = {1,    2,    3,    4,    5,    6,    7,    8, 0xFF,
                                    0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 9};
  for (unsigned width = 1; width <= 8; ++width) {
    GenericContext context;
    ASSERT_EQ(AddMultipleFieldsToGenericContext(context.get(), "Stat_7_", source, width, 2), 1);
    ASSERT_EQ(AddMultipleFieldsToGenericContext(context.get(), "bare", source + 8, width, 1), 1);
    const uint64_t mask = ~uint64_t{0} >> (64 - 8 * width);
    uint64_t second = 0;
    for (unsigned i = 2 * width; i-- > width;) second = second << 8 | source[i];
    EXPECT_EQ(entriesOf(context),
              (Entries{{"Stat_7_0", 0x0807060504030201 & mask}, {"Stat_7_1", second}, {"bare", mask}}));
  }
}

TEST(Context, RefusedAppendsLeaveItAsItWas) {
  GenericContext context;
  const unsigned char source[32] = {};
  EXPECT_EQ(AddMultipleFieldsToGenericContext(context.get(), "n", source, 9, 1), 0);
  EXPECT_EQ(AddMultipleFieldsToGenericContext(context.get(), "n", source, 9, 3), 0);
  EXPECT_EQ(AddMultipleFieldsToGenericContext(context.get(), "n", source, 1, 65536), 0);
  EXPECT_EQ(AddMultipleFieldsToGenericContext(nullptr, "n", source, 1, 2), 0);
  EXPECT_EQ(AddSingleValueToGenericContext(nullptr, "", "n", 1), 0);
  EXPECT_EQ(AddMultipleFieldsToGenericContext(nullptr, "n", nullptr, 9, 0), 1);
  EXPECT_EQ(AddMultipleFieldsToGenericContext(nullptr, "n", nullptr, 0, 70000), 1);
  EXPECT_TRUE(entries(context).empty());
  EXPECT_EQ(context->nameTail, nullptr);
}

TEST(Context, ReleaseMakesItFreshAgain) {
  ReleaseGenericParserCxt(nullptr);
  KSPReleaseContext(nullptr);
  KSPParseContext context{};
  for (int round = 0; round < 2; ++round) {
    AddSingleValueToGenericContext(&context.entries, "", "n", 1);
    AddSingleValueToGenericContext(&context.entries, "", "m", 2);
    context.reserved2 = context.hostReads = context.exportVersion = 5;
    EXPECT_EQ(entriesOf(context), (Entries{{"n", 1}, {"m", 2}}));
    for (int again = 0; again < 2; ++again) KSPReleaseContext(&context);
    const auto* const bytes = reinterpret_cast<const unsigned char*>(&context);
    EXPECT_TRUE(std::all_of(bytes, bytes + sizeof context, [](unsigned char byte) { return byte == 0; }));
  }
}

TEST(Context, OwnersMoveTheirEntries) {
  static_assert(std::ranges::forward_range<EntryView> && std::ranges::view<EntryView> &&
                !std::is_copy_constructible_v<GenericContext>);
  GenericContext one;
  AddSingleValueToGenericContext(one.get(), "", "n", 1);
  GenericContext other = std::move(one);
  GenericContext third;
  AddSingleValueToGenericContext(third.get(), "", "old", 2);
  third = std::move(other);
  EXPECT_EQ(entriesOf(third), (Entries{{"n", 1}}));
  const auto found = std::ranges::find(entries(third), "n", &Entry::name);
  EXPECT_EQ((*found).value, 1U);
}

TEST(Numbers, RoundSig) {
  const struct {
    uint64_t value, digits, expected;
  } cases[] = {{12345, 2, 12000},
               {12500, 2, 13000},
               {12499, 2, 12000},
               {7, 0, 10},
               {4, 0, 0},
               {123, 5, 123},
               {0, 3, 0},
               {5, 1, 5},
               {15, 1, 20},
               {14, 1, 10},
               {95, 1, 100},
               {1000000000000000000, 0, 0},
               {500000000000000000, 0, 1000000000000000000},
               {999999999999999999, 18, 1000000000000000000},
               {~uint64_t{0}, 4, ~uint64_t{0}},
               {~uint64_t{0}, 2, 18000000000000000000U},
               {~uint64_t{0}, ~uint64_t{0}, ~uint64_t{0}}};
  for (const auto& c : cases)
    EXPECT_EQ(roundSig(c.value, c.digits), c.expected) << c.value << ", " << c.digits;
}

TEST(Numbers, UserCapacity) {
  const struct {
    uint32_t capacity;
    int32_t expected;
  } cases[] = {{0, 0},
               {2, 0},
               {511, 0},
               {512, 1},
               {120000, 128},
               {131072, 256},
               {1000000, 1024},
               {1048575, 1024},
               {1048576, 2048},
               {1376255, 2048},
               {1376256, 1536},
               {1770495, 1536},
               {1770496, 2048},
               {1073741823, 1048576},
               {1073741824, 2097152},
               {~0U, 4194304}};
  for (const auto& c : cases) EXPECT_EQ(GetUserCapacityInGB(c.capacity), c.expected) << c.capacity;
}

}  // namespace
}  // namespace ksp::test
