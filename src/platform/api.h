// What the shared client library shows of itself: the classes and functions that are marked so, and nothing else. The
// mark means nothing anywhere else.
#pragma once

#define VRX_CLIENT_API __attribute__((visibility("default")))
