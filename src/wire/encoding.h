// The body of a reply: a keyed archive as one D-Bus dictionary, a{sv}, with the archive under the key "root". Without a
// root the reply is null. docs/formats.md has the whole description. In short:
//
//     boolean b, integer x, double d, string s, array av, dictionary a{sv}
//     date                            (sd), a tag and seconds since 1970
//     string that D-Bus cannot carry  (say), a tag and its bytes
//     such a key                      "$x" and its bytes in hexadecimal
//
// Nulls and data are left out. A key that begins with a single "$" belongs to the archive or the encoding; the archive
// doubles the "$" of any other. A message belongs to one thread.
#pragma once

#include <systemd/sd-bus.h>

#include <string_view>

#include "vrx/platform/error.h"
#include "vrx/platform/limits.h"
#include "vrx/platform/value.h"

namespace vrx::wire {

// The deepest reply: a document inside a record inside a device info inside a list.
inline constexpr int replyDepth = platform::limits::documentDepth + 3;

// Appends the dictionary to a message that is being built. Returns a negative errno when that fails, because a value is
// nested deeper than replyDepth (-ELOOP) or memory is short; the message is then useless.
int appendReply(sd_bus_message* message, const platform::Value& root);

// About how many bytes a value takes in a message.
std::size_t encodedBytes(const platform::Value& value);

// The root of a reply, or null when it is absent. Anything that the encoding does not produce, or that exceeds the
// limits of a document, is an error.
platform::Result<platform::Value> readReply(sd_bus_message* message);

// Whether D-Bus carries these bytes as a string: UTF-8 without NUL and, as sd-bus demands, without the code points that
// are not characters.
bool isCarriedAsString(std::string_view bytes);

}  // namespace vrx::wire
