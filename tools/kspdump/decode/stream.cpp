// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/decode/stream.h"

namespace kspdump {

using std::to_string;

void tellSize(Capture& capture, ksp::Record record, const StreamWords& words) {
  const ksp::RecordName name = record.name();
  const std::string title = std::string(name.view()) + "(" + to_string(record.key) + ") carries " +
                            counted(record.announced, words.unit);
  if (!record.isAsConfigured()) {
    capture.find(record.offset, title + ", " + to_string(record.configured) + " configured");
  } else {
    capture.find(record.offset, title + ", " + to_string(leftOver(record, words)) +
                                    " left over, fewer than an element of " +
                                    to_string(record.elements.width()));
  }
}

void findEnd(Capture& capture, ksp::Ending ending, const StreamWords& words) {
  using Reason = ksp::EndReason;
  const uint64_t size = capture.bytes.size();
  const uint64_t left = size - ending.offset;
  if (ending.reason == Reason::kTail) {
    capture.find(ending.offset, counted(left, "byte") + " left over, fewer than a " + words.header);
  } else if (ending.reason == Reason::kInvalidKey) {
    capture.find(ending.offset, "key " + to_string(ending.key) + " is invalid, so the rest cannot be read");
  } else if (ending.reason == Reason::kOverrun) {
    capture.find(ending.offset, "key " + to_string(ending.key) + " announces " +
                                    counted(ending.announced, words.unit) + ", but the capture ends after " +
                                    to_string((left - words.headerSize) / words.unitSize));
  } else if (ending.reason == Reason::kEndMarker) {
    const uint64_t hidden = endOfZeros(capture.bytes, behindEnd(capture.bytes, ending, words));
    if (hidden != size) {
      capture.find(hidden, counted(size - hidden, "byte") + " behind the " + words.end +
                               (size - hidden == 1 ? " that is not zero" : " that are not all zeros") +
                               ", and not read");
    }
  }
}

}  // namespace kspdump
