// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/kspdump/decode/capture.h"

namespace kspdump {

/// Returns null for a header that can be used, else what is wrong with it.
const char* headerFault(Bytes header);

/// Measures how much of a capture is records of the fixed layout that can be what a controller wrote.
Share recogniseSnapshot(Bytes bytes);

}  // namespace kspdump
