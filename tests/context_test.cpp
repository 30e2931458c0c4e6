// SPDX-License-Identifier: Apache-2.0
#include "ksp/context.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>

#include "ksp/numbers.h"
#include "tests/context_check.h"
#include "tests/streams.h"

namespace ksp::test {
namespace {

TEST(Context, NamesAreCutAt98Characters) {
  const unsigned char elements[12] = {};
  GenericContext context;
  std::string expected;
  const auto expect = [&](const std::string& name) { expected.append(" ").append(name, 0, 98).append("=0"); };
  for (const size_t length : {1U, 74U, 90U, 96U, 97U, 98U, 99U, 120U}) {
    const std::string stem(length, 'n');
    EXPECT_EQ(AddSingleValueToGenericContext(context.get(), stem.c_str(), "", 0), 1);
    EXPECT_EQ(AddSingleValueToGenericContext(context.get(), "pre", stem.c_str(), 0), 1);
    EXPECT_EQ(AddMultipleFieldsToGenericContext(context.get(), stem.c_str(), elements, 1, 12), 1);
    expect(stem);
    expect(std::string("pre").append(stem));
    for (int i = 0; i < 12; ++i) expect(stem + std::to_string(i));
  }
  EXPECT_EQ(textOf(context), expected.substr(1));
}

TEST(Context, ValuesAreWrittenOutInDecimal) {
  GenericContext context;
  for (uint64_t power = 1, i = 0; i < 20; ++i, power *= 10) {
    for (const uint64_t value : {power - 1, power, power + 1, power / 9 * 7, ~power}) {
      AddSingleValueToGenericContext(context.get(), "", "v", value);
    }
  }
  EXPECT_EQ(requireSound(*context), 100U);  // each text says the value
}

TEST(Context, ElementsOfEveryWidthAreLittleEndian) {
  const unsigned char source[] = "\1\2\3\4\5\6\7\x88\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF";
  const uint64_t bytes = 0x8807060504030201;
  for (unsigned width = 1; width <= 8; ++width) {
    const uint64_t mask = ~uint64_t{0} >> (64 - 8 * width);
    GenericContext context;
    ASSERT_EQ(AddMultipleFieldsToGenericContext(context.get(), "bare", source, width, 1), 1);
    ASSERT_EQ(AddMultipleFieldsToGenericContext(context.get(), "Stat_7_", source + 8 - width, width, 2), 1);
    const std::string expected = "bare=" + std::to_string(bytes & mask) +
                                 " Stat_7_0=" + std::to_string(bytes >> (64 - 8 * width)) +
                                 " Stat_7_1=" + std::to_string(mask);
    EXPECT_EQ(textOf(context), expected);
  }
}

TEST(Context, RefusedAppendsLeaveItAsItWas) {
  GenericContext context;
  const unsigned char source[32] = {};
  EXPECT_EQ(AddMultipleFieldsToGenericContext(context.get(), "n", source, 9, 1), 0);
  EXPECT_EQ(AddMultipleFieldsToGenericContext(context.get(), nullptr, source, 9, 3), 0);
  EXPECT_EQ(AddMultipleFieldsToGenericContext(context.get(), nullptr, source, 1, 65536), 0);
  EXPECT_EQ(AddMultipleFieldsToGenericContext(context.get(), nullptr, nullptr, 4, 0), 1);
  EXPECT_EQ(AddMultipleFieldsToGenericContext(nullptr, nullptr, source, 1, 2), 0);
  EXPECT_EQ(AddSingleValueToGenericContext(nullptr, nullptr, nullptr, 1), 0);
  EXPECT_EQ(AddMultipleFieldsToGenericContext(nullptr, nullptr, nullptr, 9, 0), 1);
  EXPECT_EQ(AddMultipleFieldsToGenericContext(nullptr, nullptr, nullptr, 0, 70000), 1);
  EXPECT_TRUE(entries(context).empty());
  EXPECT_EQ(context->nameTail, nullptr);
}

template <class Context>
void refill(void (*release)(Context*)) {
  release(nullptr);
  Context context{};
  for (int round = 0; round < 2; ++round) {
    AddSingleValueToGenericContext(&listsOf(context), "", "n", 1);
    AddSingleValueToGenericContext(&listsOf(context), "", "m", 2);
    if constexpr (std::is_same_v<Context, KSPParseContext>) context.reserved2 = context.exportVersion = 5;
    EXPECT_EQ(textOf(context), "n=1 m=2");
    for (int again = 0; again < 2; ++again) release(&context);
    const auto* const bytes = reinterpret_cast<const unsigned char*>(&context);
    EXPECT_EQ(std::count(bytes, bytes + sizeof context, 0), sizeof context);
  }
}

TEST(Context, ReleaseMakesItFreshAgain) {
  refill(ReleaseGenericParserCxt);
  refill(KSPReleaseContext);
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
  EXPECT_EQ(textOf(third), "n=1");
  const auto found = std::ranges::find(entries(third), "n", &Entry::name);
  EXPECT_EQ((*found).value, 1U);
}

TEST(Numbers, RoundSig) {
  constexpr uint64_t kMax = ~uint64_t{0};
  using Row = std::array<uint64_t, 3>;  // value, digits, expected
  for (const auto& [value, digits, expected] :
       {Row{12500, 2, 13000}, Row{12499, 2, 12000}, Row{7, 0, 10}, Row{4, 0, 0}, Row{123, 5, 123},
        Row{0, 3, 0}, Row{5, 1, 5}, Row{95, 1, 100}, Row{1000000000000000000, 0, 0},
        Row{999999999999999999, 0, 0}, Row{kMax, 0, 0}, Row{kMax, 1, 0},
        Row{500000000000000000, 0, 1000000000000000000}, Row{999999999999999999, 18, 1000000000000000000},
        Row{kMax, 4, kMax}, Row{kMax, kMax, kMax}, Row{kMax, 2, 18000000000000000000U}}) {
    EXPECT_EQ(roundSig(value, digits), expected) << value << ", " << digits;
  }
}

TEST(Numbers, UserCapacity) {
  using Row = std::pair<uint32_t, int32_t>;
  for (const auto& [capacity, expected] :
       {Row{0, 0}, Row{2, 0}, Row{511, 0}, Row{512, 1}, Row{120000, 128}, Row{131072, 256},
        Row{1000000, 1024}, Row{1048575, 1024}, Row{1048576, 2048}, Row{1376255, 2048}, Row{1376256, 1536},
        Row{1770495, 1536}, Row{1770496, 2048}, Row{1073741823, 1048576}, Row{1073741824, 2097152},
        Row{~0U, 4194304}}) {
    EXPECT_EQ(GetUserCapacityInGB(capacity), expected) << capacity;
  }
}

}  // namespace
}  // namespace ksp::test
