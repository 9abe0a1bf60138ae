// The most that a server, a client or a file may send. What exceeds a limit counts as invalid.
#pragma once

#include <cstddef>

namespace vrx::platform::limits {

// Containers within containers of a document, its root included. Stock D-Bus tools fail somewhat above it.
inline constexpr int documentDepth = 16;
// Values in a document, containers included.
inline constexpr std::size_t documentValues = 100'000;
// Bytes of a document that is parsed, and of an answer that is received.
inline constexpr std::size_t documentBytes = 4 * 1024 * 1024;
inline constexpr std::size_t answerBytes = documentBytes;
// Bytes of a file that is read, and of a property list. More than those of an answer, so that every answer can be kept
// as a property list: there a text with a letter beyond ASCII takes two bytes a letter, and each value some more.
inline constexpr std::size_t fileBytes = 3 * documentBytes;

// Bytes of a string argument of a request: of a serial number or a bundle identifier.
inline constexpr std::size_t argumentBytes = 1024;
// Bytes of the description of a log line's argument.
inline constexpr std::size_t logArgumentBytes = 16 * 1024;

// Bytes of a request.
inline constexpr std::size_t requestBytes = 16 * 1024;
// Bytes of replies that a connection's client has not taken yet, and of all connections together. Beyond them their
// further requests wait.
inline constexpr std::size_t unsentBytesPerConnection = 2 * documentBytes;
inline constexpr std::size_t unsentBytes = 8 * unsentBytesPerConnection;
// Connections that are served at the same time, and open requests of one connection.
inline constexpr std::size_t connections = 64;
inline constexpr std::size_t requestsPerConnection = 64;
// Open requests of all clients together, and of one user's clients while another user's wait.
inline constexpr std::size_t requests = 256;
inline constexpr std::size_t requestsPerUser = 128;
// HTTP transfers at the same time, in all and to one host.
inline constexpr std::size_t transfers = 16;
inline constexpr std::size_t transfersPerHost = 8;
// All HTTP answers together that a process keeps.
inline constexpr std::size_t storedAnswerBytes = 1024 * 1024;

}  // namespace vrx::platform::limits
