#pragma once

#include <string>

#include "tools/kspdump/capture.h"
#include "tools/kspdump/render.h"

namespace kspdump {

/// Compares two captures of one kind record by record, the k-th of a key with the k-th, and renders what
/// changed.
std::string renderDiff(const Capture& before, const Capture& after, Format format, size_t width);

}  // namespace kspdump
