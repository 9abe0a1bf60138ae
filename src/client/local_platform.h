// The platform of a program that only reads records: what their derived texts and day counts need, and nothing else.
#pragma once

namespace vrx::client {

// Makes it the current platform if there is none. Any thread may call this. Call it before any record is read.
void installPlatformIfNone();

}  // namespace vrx::client
