// The platform of a program that only reads records: what their derived texts and day counts need, and nothing else.
#pragma once

#include <string>

#include "vrx/platform/date.h"

namespace vrx::client {

// Makes it the current platform if there is none. Any thread may call this. Call it before any record is read.
void installPlatformIfNone();

// Its locale and its day from now on, in place of the environment's and of 86400 seconds. Any thread.
void setLocalSurroundings(const std::string& locale, platform::Duration day);

}  // namespace vrx::client
