// The media statistics stream.

#include "tools/kspdump/decode/stream.h"

namespace kspdump {

void decodeMedia(const Decoding& /*decoding*/, Capture& capture, Collector& collector) {
  ksp::MediaRecords records(capture.bytes.data(), capture.bytes.size());
  capture.share = walk(records, capture.bytes, kMediaWords, [&](const ksp::Record& record) {
    findSize(capture, record, kMediaWords);
    collect(collector, record, valuesOf(capture, record, kMediaWords));
  });
  findEnd(capture, records.ending(), kMediaWords);
}

}  // namespace kspdump
