// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/decode/recognise.h"

#include "tools/kspdump/decode/snapshot.h"
#include "tools/kspdump/decode/stream.h"

namespace kspdump {

namespace {

/// What a capture of the kind looks like, as the end of a sentence.
const char* likeness(Kind kind) {
  constexpr const char* kLikenesses[] = {"statistics", "statistics", "media statistics", "a snapshot"};
  return kLikenesses[static_cast<size_t>(kind)];
}

}  // namespace

Share recognise(Bytes bytes, Kind kind) {
  const auto pass = [](const ksp::Record&) {};
  if (kind == Kind::kSnapshot) return recogniseSnapshot(bytes);
  if (kind == Kind::kMedia) {
    ksp::MediaRecords records(bytes.data(), bytes.size());
    return walk(records, bytes, kMediaWords, pass);
  }
  ksp::StatisticsRecords records(bytes.data(), bytes.size());
  return walk(records, bytes, kStatsWords, pass);
}

std::optional<Recognised> identify(Bytes bytes) {
  std::optional<Recognised> best;
  for (const Kind kind : {Kind::kStats, Kind::kMedia, Kind::kSnapshot}) {
    const Share share = recognise(bytes, kind);
    if (share.isEnough() && (!best || share.percent() > best->share.percent())) best = {kind, share};
  }
  return best;
}

void findWrongKind(Capture& capture) {
  // A header's records that are not in use are spoken of where it is read.
  const bool isUnused = capture.share.of == 0 && !capture.header.empty();
  if (!capture.bytes.empty() && (capture.share.isEnough() || isUnused)) return;
  std::string reason;
  if (capture.bytes.empty()) {
    reason = "the capture is empty";
  } else if (capture.share.of == 0) {
    reason = "there is nothing in it but zeros";
  } else if (const auto other = identify(capture.bytes)) {
    reason = std::string("looks like ") + likeness(other->kind) + ", " +
             std::to_string(other->share.percent()) + " % recognised";
  } else {
    reason = std::string("does not look like ") + likeness(capture.kind) + ": " +
             std::to_string(capture.share.percent()) + " % recognised";
  }
  // All else that is found follows from it.
  capture.findings.insert(capture.findings.begin(), {0, std::move(reason)});
}

}  // namespace kspdump
