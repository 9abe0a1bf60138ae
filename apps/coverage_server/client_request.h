// Reads one request from a connection: where it ends, and its body. The HTTP library interprets the head.
#pragma once

#include <optional>
#include <string>

#include "coverage_server/connection.h"

namespace vrx::coverage_server {

struct ClientRequest {
    std::string head;  // as it was sent, with the empty line at its end
    // Joined when it came in chunks. A compressed body stays compressed: a few bytes can inflate without limit.
    std::string body;
    int refusal = 0;  // the status of the refusal, when the request is malformed, incomplete or too long
};

// Nothing when the client leaves before its first line is complete.
std::optional<ClientRequest> readRequest(Connection& connection);

}  // namespace vrx::coverage_server
