// What a server, a client or a file may send at the most; what is over a limit reads as invalid.
#pragma once

#include <cstddef>

namespace vrx::platform::limits {

// Containers within containers of a document, its root included. Stock D-Bus tools fail somewhat above it.
inline constexpr int documentDepth = 16;
// Values in a document, containers included.
inline constexpr std::size_t documentValues = 100'000;
// A document that is parsed, an answer that is received.
inline constexpr std::size_t documentBytes = 4 * 1024 * 1024;
inline constexpr std::size_t answerBytes = documentBytes;
// A file that is read, and a property list: whatever an answer holds can be kept as one. There a text with a letter
// beyond ASCII takes two bytes a letter, and each value some more.
inline constexpr std::size_t fileBytes = 3 * documentBytes;

// A string argument of a request: serial numbers and bundle identifiers.
inline constexpr std::size_t argumentBytes = 1024;
// Connections that are served at the same time, and requests that one of them may have open.
inline constexpr std::size_t connections = 64;
inline constexpr std::size_t requestsPerConnection = 64;

}  // namespace vrx::platform::limits
