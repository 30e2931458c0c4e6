// SPDX-License-Identifier: Apache-2.0
// The media statistics stream.

#include "tools/kspdump/decode/stream.h"

namespace kspdump {

void decodeMedia(const Decoding& /*decoding*/, Capture& capture, Collector& collector) {
  const Bytes bytes = capture.bytes;
  ksp::MediaRecords records(bytes.data(), bytes.size());
  capture.share = walk(records, bytes, kMediaWords, [&](const ksp::Record& record) {
    findSize(capture, record, kMediaWords);
    collect(collector, record, valuesOf(bytes, record, kMediaWords));
  });
  findEnd(capture, records.ending(), kMediaWords);
}

}  // namespace kspdump
