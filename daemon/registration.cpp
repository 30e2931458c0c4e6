// SPDX-License-Identifier: Apache-2.0
#include "daemon/registration.h"

#include "daemon/activity_handler.h"
#include "platform/background_activity.h"

namespace {

/// What the program tells about itself: `readelf -p .info_list brellium` shows it.
struct InformationList {
  char identifierKey[sizeof "Identifier"] = "Identifier";
  char identifier[sizeof "com.vantor.brellium"] = "com.vantor.brellium";
  char displayNameKey[sizeof "DisplayName"] = "DisplayName";
  char displayName[sizeof "Daemon to alert users regarding applications using excessive NAND"] =
      "Daemon to alert users regarding applications using excessive NAND";
};

[[gnu::section(".info_list"), gnu::used]] const InformationList informationList;

}  // namespace

void registerActivityHandler() {
  RegisterActivity(informationList.identifier, ActivityCheckIn, activityHandler);
}
