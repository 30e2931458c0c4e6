// The parsers beside two yardsticks: the same appends with printf formatting, and the floor, which only
// allocates, links and frees the nodes that the parser would have filled.

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
void plainAppend(GenericParserContext& context, const char* prefix, const char* name, uint64_t value) {
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

template <Nodes nodes>
void plainAppend(GenericParserContext& context, const char* name, const ksp::Elements& elements) {
  if (elements.size() == 1) return plainAppend<nodes>(context, "", name, elements[0]);
  for (uint32_t i = 0; i < elements.size(); ++i) {
    char index[16];
    static_cast<void>(std::snprintf(index, sizeof index, "%d", static_cast<int>(i)));
    plainAppend<nodes>(context, name, index, elements[i]);
  }
}

void plainGeneric(GenericParserContext* context, const void* stream, uint32_t length) {
  ksp::StatisticsRecords records(stream, length);
  for (const ksp::Record& record : records) {
    if (record.row == nullptr) continue;
    char name[KSPNodeTextSize];
    static_cast<void>(
        std::snprintf(name, sizeof name, record.isArray ? "%s_" : "%s", record.row->name.data()));
    plainAppend<Nodes::kZeroed>(*context, name, record.elements);
  }
}

void plainLegacy(KSPParseContext* context, const void* stream, uint32_t length) {
  ksp::StatisticsRecords records(stream, length, ksp::StatisticsFraming::kUnmarked);
  for (const ksp::Record& record : records) {
    if (record.row == nullptr) continue;
    plainAppend<Nodes::kPlain>(context->entries, record.row->name.data(), record.elements);
  }
}

void plainMedia(GenericParserContext* context, const void* stream, uint32_t length) {
  ksp::MediaRecords records(stream, length);
  for (const ksp::Record& record : records) {
    if (record.row == nullptr) continue;
    plainAppend<Nodes::kZeroed>(*context, record.row->name.data(), record.elements);
  }
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
  // Only the same work is worth comparing.
  Context expected;
  Context found;
  plain(expected.get(), stream.data(), static_cast<uint32_t>(stream.size()));
  library(found.get(), stream.data(), static_cast<uint32_t>(stream.size()));
  const bool same = std::ranges::equal(ksp::entries(found), ksp::entries(expected), [](auto one, auto other) {
    return one.name == other.name && one.value == other.value;
  });
  const auto entries = std::ranges::distance(ksp::entries(expected));
  if (!same || entries == 0) {
    std::cerr << name << ": the library and the plain yardstick differ\n";
    std::exit(1);
  }
  benchmark::RegisterBenchmark((name + "/library").c_str(), [=](benchmark::State& state) {
    Context context;
    measureParser(state, stream, library, context);
  });
  benchmark::RegisterBenchmark((name + "/plain").c_str(), [=](benchmark::State& state) {
    Context context;
    measureParser(state, stream, plain, context);
  });
  benchmark::RegisterBenchmark((name + "/floor").c_str(),
                               [=](benchmark::State& state) { measureFloor<nodes>(state, entries); });
}

}  // namespace

int main(int argc, char** argv) {
  const Bytes statistics = statisticsStream();
  group<ksp::GenericContext, Nodes::kZeroed>("generic", statistics, KSPFTLParseBufferToCxt, plainGeneric);
  group<ksp::LegacyContext, Nodes::kPlain>("legacy", statistics, KSPParseBufferToCxt, plainLegacy);
  group<ksp::GenericContext, Nodes::kZeroed>("media", mediaStream(), KSPMSPParseBufferToCxt, plainMedia);
  constexpr ksp::Ratio kRatios[] = {
      {"generic/library", "generic/floor", "at most 1.25"},
      {"generic/plain", "generic/library", "at least 4"},
      {"legacy/library", "legacy/floor", "at most 1.25"},
      {"legacy/plain", "legacy/library", "at least 4"},
      {"media/library", "media/floor", "at most 1.25"},
      {"media/plain", "media/library", "at least 4"},
  };
  return ksp::runWithRatios(argc, argv, kRatios);
}
