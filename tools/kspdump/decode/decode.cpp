#include "tools/kspdump/decode/decode.h"

#include <fnmatch.h>

#include <algorithm>
#include <charconv>
#include <cstring>

#include "tools/kspdump/decode/recognise.h"

namespace kspdump {

void Collector::add(uint64_t offset, uint32_t key, std::string_view name, bool isArray,
                    const Values& values) {
  ++capture_.recordCount;
  const std::string& match = decoding_.match;
  if (!match.empty() && fnmatch(match.c_str(), std::string(name).c_str(), 0) != 0) return;
  ++capture_.shownCount;
  records_[count_++] = {offset, key, isArray, name, values};
  if (count_ == kBatch) finish();
}

void Collector::addNumbered(uint64_t offset, uint32_t key, std::string_view prefix, bool isArray,
                            const Values& values) {
  char(&name)[kLongestNumbered] = names_[count_];
  std::memcpy(name, prefix.data(), prefix.size());
  const char* const end = std::to_chars(name + prefix.size(), std::end(name), key).ptr;
  add(offset, key, {name, static_cast<size_t>(end - name)}, isArray, values);
}

void Collector::finish() {
  if (count_ != 0) take_({records_.data(), count_});
  count_ = 0;
}

void decode(const Decoding& decoding, Capture& capture, const TakeRecords& take) {
  constexpr void (*kDecoders[])(const Decoding&, Capture&, Collector&) = {decodeStats, decodeSummary,
                                                                          decodeMedia, decodeSnapshot};
  capture.clear();
  capture.kind = decoding.kind;
  capture.header = decoding.header;
  capture.size = capture.bytes.size();
  Collector collector(capture, decoding, take);
  kDecoders[static_cast<size_t>(decoding.kind)](decoding, capture, collector);
  collector.finish();
  findWrongKind(capture);
}

}  // namespace kspdump
