// What a server, a client or a file may send at the most; what is over a limit reads as invalid.
#pragma once

#include <cstddef>

namespace vrx::platform::limits {

// Containers within containers of a document, its root included. Stock D-Bus tools fail somewhat above it.
inline constexpr int documentDepth = 16;
// Values in a document, containers included.
inline constexpr std::size_t documentValues = 100'000;
// A document that is parsed, a file that is read, an answer that is received.
inline constexpr std::size_t documentBytes = 4 * 1024 * 1024;
inline constexpr std::size_t fileBytes = documentBytes;
inline constexpr std::size_t answerBytes = documentBytes;

// A string argument of a request: serial numbers and bundle identifiers.
inline constexpr std::size_t argumentBytes = 1024;
// Connections that are served at the same time, and requests that one of them may have open.
inline constexpr std::size_t connections = 64;
inline constexpr std::size_t requestsPerConnection = 64;

}  // namespace vrx::platform::limits
