// A follow-up item as a property value: how host.db keeps it, and what the tools print and read. Any thread may call.
//
//     {"uniqueIdentifier": "…", "groupIdentifier": "…", "targetBundleIdentifier": "…", "extensionIdentifier": "…",
//      "displayStyle": 18, "title": "…", "informativeFooterText": "…", "expirationDate": 1769860799.999,
//      "userInfo": {…}, "actions": [{"label": "…", "url": "…"}]}
//
// Absent members are left out. The expiration date is in seconds since 1970, so that its fraction is exact in every
// form.
#pragma once

#include "vrx/platform/error.h"
#include "vrx/platform/follow_up_controller.h"
#include "vrx/platform/value.h"

namespace vrx::host {

platform::Value followUpDocument(const platform::FollowUpItem& item);

// Requires an identifier and the right types, and rejects unknown keys. The error names the first mistake.
platform::Result<platform::FollowUpItem> followUpFromDocument(const platform::Value& document);

}  // namespace vrx::host
