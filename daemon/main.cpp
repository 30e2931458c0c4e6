// SPDX-License-Identifier: Apache-2.0
#include "daemon/registration.h"
#include "platform/main_loop.h"
#include "platform/system_log.h"

int main() {
  SystemLog("start brellium");
  registerActivityHandler();
  RunMainLoop();
}
