// SPDX-License-Identifier: Apache-2.0
// The parsers beside two yardsticks: the plain parsers with printf formatting, and the floor, which only
// allocates, links and frees the nodes that the parser would have filled. And what a client pays that only
// looks, through a context and through the records themselves.

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <iostream>
#include <iterator>
#include <string>
#include <vector>

#include "bench/ratio.h"
#include "ksp/entries.hpp"
#include "ksp/ksp.h"
#include "ksp/records.hpp"
#include "tests/context_check.h"
#include "tests/plain_parsers.h"

namespace {

using Bytes = std::vector<unsigned char>;

void put(Bytes& bytes, uint64_t number, unsigned width) {
  for (unsigned i = 0; i < width; ++i) bytes.push_back(static_cast<unsigned char>(number >> 8 * i));
}

/// Counters as a controller has them: of every magnitude up to 2^32, mixed.
class Counters {
 public:
  uint64_t next() {
    state_ = state_ * 6364136223846793005U + 1442695040888963407U;
    return state_ >> 32 >> (state_ >> 27) % 32;
  }

 private:
  uint64_t state_ = 1;
};

Bytes statisticsStream() {
  Bytes bytes;
  Counters counters;
  for (const ksp::KeyEntry& key : ksp::kStatsKeys) {
    put(bytes, key.key, 4);
    put(bytes, key.count, 4);
    for (uint32_t i = 0; i < key.count; ++i) put(bytes, counters.next(), 8);
  }
  return bytes;
}

Bytes mediaStream() {
  Bytes bytes;
  Counters counters;
  for (const ksp::KeyEntry& key : ksp::mspKeyTable) {
    put(bytes, key.key, 2);
    put(bytes, uint64_t{key.count} * key.width, 2);
    for (unsigned i = 0; i < key.count; ++i) put(bytes, counters.next(), key.width);
  }
  return bytes;
}

void link(GenericParserContext& context, NameValueNode* name, NameValueNode* value) {
  (context.nameTail != nullptr ? context.nameTail->next : context.nameHead) = name;
  (context.valueTail != nullptr ? context.valueTail->next : context.valueHead) = value;
  context.nameTail = name;
  context.valueTail = value;
}

enum class Nodes { kZeroed, kPlain };

template <Nodes nodes>
NameValueNode* newNode() {
  constexpr size_t kSize = sizeof(NameValueNode);
  return static_cast<NameValueNode*>(nodes == Nodes::kZeroed ? std::calloc(1, kSize) : std::malloc(kSize));
}

template <Nodes nodes>
void appendByPrintf(GenericParserContext& context, const char* prefix, const char* name, uint64_t value) {
  NameValueNode* const valueNode = newNode<nodes>();
  NameValueNode* const nameNode = newNode<nodes>();
  if (valueNode == nullptr || nameNode == nullptr) std::abort();
  nameNode->next = valueNode->next = nullptr;
  static_cast<void>(std::snprintf(nameNode->text, sizeof nameNode->text - 1, "%s%s", prefix, name));
  static_cast<void>(std::snprintf(valueNode->text, sizeof valueNode->text - 1, "%llu",
                                  static_cast<unsigned long long>(value)));
  nameNode->text[sizeof nameNode->text - 1] = valueNode->text[sizeof valueNode->text - 1] = '\0';
  valueNode->value = value;
  link(context, nameNode, valueNode);
}

/// A plain parser with the signature of the library's.
template <Nodes nodes, class Plain>
auto intoNodes(Plain plain) {
  return [=](auto* context, const unsigned char* stream, uint32_t length) {
    const auto append = [&](const char* prefix, const char* name, uint64_t value) {
      appendByPrintf<nodes>(ksp::test::listsOf(*context), prefix, name, value);
    };
    return plain(*context, stream, length, append);
  };
}

template <class Parse, class Owner>
void measureParser(benchmark::State& state, const Bytes& stream, Parse parse, Owner& context) {
  for (auto _ : state) {
    parse(context.get(), stream.data(), static_cast<uint32_t>(stream.size()));
    benchmark::DoNotOptimize(*context);
    context.reset();
  }
}

template <Nodes nodes>
void measureFloor(benchmark::State& state, std::ptrdiff_t entries) {
  ksp::GenericContext context;
  for (auto _ : state) {
    for (std::ptrdiff_t i = 0; i < entries; ++i) {
      NameValueNode* const value = newNode<nodes>();
      NameValueNode* const name = newNode<nodes>();
      if (value == nullptr || name == nullptr) std::abort();
      value->next = name->next = nullptr;
      link(*context.get(), name, value);
    }
    benchmark::DoNotOptimize(*context);
    context.reset();
  }
}

/// Registers GROUP/library, GROUP/plain and GROUP/floor.
template <class Context, Nodes nodes, class Library, class Plain>
void group(const std::string& name, const Bytes& stream, Library library, Plain plain) {
  const auto length = static_cast<uint32_t>(stream.size());
  Context filled;
  library(filled.get(), stream.data(), length);
  const auto entries = std::ranges::distance(ksp::entries(filled));
  // Only the same work is worth comparing.
  if (!ksp::test::agrees<Context>(library, plain, stream.data(), length) || entries == 0) {
    std::cerr << name << ": the library and the plain yardstick differ\n";
    std::exit(1);
  }
  benchmark::RegisterBenchmark((name + "/library").c_str(), [=](benchmark::State& state) {
    Context context;
    measureParser(state, stream, library, context);
  });
  benchmark::RegisterBenchmark((name + "/plain").c_str(), [=](benchmark::State& state) {
    Context context;
    measureParser(state, stream, intoNodes<nodes>(plain), context);
  });
  benchmark::RegisterBenchmark((name + "/floor").c_str(),
                               [=](benchmark::State& state) { measureFloor<nodes>(state, entries); });
}

/// What a client has seen that looked at every name and every value.
struct Seen {
  uint64_t entries = 0;
  uint64_t letters = 0;
  uint64_t values = 0;

  bool operator==(const Seen&) const = default;
};

/// Looks at every entry of a context that is filled and released for it.
Seen throughContext(const Bytes& stream) {
  ksp::GenericContext context;
  KSPFTLParseBufferToCxt(context.get(), stream.data(), static_cast<uint32_t>(stream.size()));
  Seen seen;
  for (const auto [name, value] : ksp::entries(context)) {
    ++seen.entries;
    // The index behind an array's name is the context's alone.
    seen.letters += static_cast<unsigned char>(name[0]);
    seen.values += value;
  }
  return seen;
}

Seen throughRecords(const Bytes& stream) {
  Seen seen;
  ksp::StatisticsRecords records(stream.data(), stream.size());
  for (const ksp::Record& record : records) {
    const ksp::RecordName name = record.name();
    for (const uint64_t value : record.elements) {
      ++seen.entries;
      seen.letters += static_cast<unsigned char>(name.view()[0]);
      seen.values += value;
    }
  }
  return seen;
}

/// Registers look/context and look/records.
void lookGroup(const Bytes& stream) {
  if (throughContext(stream) != throughRecords(stream) || throughRecords(stream).entries == 0) {
    std::cerr << "look: the context and the records differ\n";
    std::exit(1);
  }
  benchmark::RegisterBenchmark("look/context", [=](benchmark::State& state) {
    for (auto _ : state) benchmark::DoNotOptimize(throughContext(stream));
  });
  benchmark::RegisterBenchmark("look/records", [=](benchmark::State& state) {
    for (auto _ : state) benchmark::DoNotOptimize(throughRecords(stream));
  });
}

}  // namespace

int main(int argc, char** argv) {
  const Bytes statistics = statisticsStream();
  group<ksp::GenericContext, Nodes::kZeroed>("generic", statistics, KSPFTLParseBufferToCxt,
                                             ksp::test::plainGeneric);
  group<ksp::LegacyContext, Nodes::kPlain>("legacy", statistics, KSPParseBufferToCxt, ksp::test::plainLegacy);
  group<ksp::GenericContext, Nodes::kZeroed>("media", mediaStream(), KSPMSPParseBufferToCxt,
                                             ksp::test::plainMedia);
  lookGroup(statistics);
  constexpr ksp::Ratio kRatios[] = {
      {"generic/library", "generic/floor", "at most 1.25"},
      {"generic/plain", "generic/library", "at least 4"},
      {"legacy/library", "legacy/floor", "at most 1.25"},
      {"legacy/plain", "legacy/library", "at least 4"},
      {"media/library", "media/floor", "at most 1.25"},
      {"media/plain", "media/library", "at least 4"},
      {"look/context", "look/records", "at least 8"},
  };
  return ksp::runWithRatios(argc, argv, kRatios);
}
