// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tools/kspdump/decode/capture.h"

namespace kspdump {

/// What one kind makes of a capture.
struct Recognised {
  Kind kind;
  Share share;
};

/// Measures how much of a capture's bytes a kind recognises; of a snapshot, in the fixed layout.
Share recognise(Bytes bytes, Kind kind);

/// The kind that recognises most of a capture, if one recognises half of it.
std::optional<Recognised> identify(Bytes bytes);

/// Names, in a capture that is decoded, what it looks like where its own kind recognises too little of it.
void findWrongKind(Capture& capture);

}  // namespace kspdump
