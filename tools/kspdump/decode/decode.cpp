// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/decode/decode.h"

#include <charconv>
#include <cstring>

#include "tools/kspdump/decode/recognise.h"

namespace kspdump {

void Collector::addNumbered(uint64_t offset, uint32_t key, std::string_view prefix, bool isArray,
                            const Values& values) {
  char(&name)[kLongestNumbered] = names_[count_];
  std::memcpy(name, prefix.data(), prefix.size());
  const char* const end = std::to_chars(name + prefix.size(), std::end(name), key).ptr;
  add(offset, key, {name, static_cast<size_t>(end - name)}, isArray, values);
}

void Collector::handOn() {
  if (count_ != 0) take_({records_.data(), count_});
  count_ = 0;
}

void Collector::finish() {
  handOn();
  for (size_t i = 0; i < used_.size(); ++i) {
    if (!used_[i]) capture_.find(0, selection_.text(i) + " selects nothing");
  }
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
