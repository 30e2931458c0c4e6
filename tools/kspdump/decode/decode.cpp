// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/decode/decode.h"

#include "tools/kspdump/decode/recognise.h"

namespace kspdump {

void Collector::handOn() {
  take_(batch_.records());
  batch_.count_ = 0;
}

void Collector::finish() {
  if (batch_.count_ != 0) take_(batch_.records());
  for (size_t i = 0; i < used_.size(); ++i) {
    if (!used_[i]) capture_.find(0, selection_.text(i) + " selects nothing");
  }
}

void decode(const Decoding& decoding, Capture& capture, Batch& batch, const TakeRecords& take) {
  constexpr void (*kDecoders[])(const Decoding&, Capture&, Collector&) = {decodeStats, decodeSummary,
                                                                          decodeMedia, decodeSnapshot};
  capture.clear();
  capture.kind = decoding.kind;
  capture.header = decoding.header;
  capture.size = capture.bytes.size();
  Collector collector(capture, decoding, batch, take);
  kDecoders[static_cast<size_t>(decoding.kind)](decoding, capture, collector);
  collector.finish();
  findWrongKind(capture);
}

}  // namespace kspdump
