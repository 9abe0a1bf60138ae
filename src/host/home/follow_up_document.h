// A follow-up item as a property value: how host.db keeps it, and what the tools print and read. Any thread may call.
//
//     {"uniqueIdentifier": "…", "groupIdentifier": "…", "targetBundleIdentifier": "…", "extensionIdentifier": "…",
//      "displayStyle": 18, "title": "…", "informativeFooterText": "…", "expirationDate": 1769860799.999,
//      "userInfo": {…}, "actions": [{"label": "…", "url": "…"}]}
//
// What an item does not have is not there. The expiration date is the seconds since 1970, so that its fraction is exact
// in every form.
#pragma once

#include "vrx/platform/error.h"
#include "vrx/platform/follow_up_controller.h"
#include "vrx/platform/value.h"

namespace vrx::host {

platform::Value followUpDocument(const platform::FollowUpItem& item);

// Needs an identifier and, of what is there, the right types; knows no other keys. The error's text names the first
// thing that is wrong.
platform::Result<platform::FollowUpItem> followUpFromDocument(const platform::Value& document);

}  // namespace vrx::host
