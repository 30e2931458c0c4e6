// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <poll.h>

namespace kspdump {

/// Waits until a descriptor that is not to be waited for can be read (`POLLIN`) or written (`POLLOUT`).
inline void waitFor(int descriptor, short event) {
  pollfd waiting = {.fd = descriptor, .events = event, .revents = {}};
  ppoll(&waiting, 1, nullptr, nullptr);
}

}  // namespace kspdump
