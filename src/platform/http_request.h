// HTTP requests and the sessions that send them. Sessions may be used from any thread.
#pragma once

#include <map>
#include <optional>
#include <string>

#include "vrx/platform/date.h"
#include "vrx/platform/error.h"
#include "vrx/platform/task.h"
#include "vrx/platform/value.h"

namespace vrx::platform {

// Header names compare without regard to case and keep the case in which they were set first.
struct HeaderNameOrder {
    using is_transparent = void;
    bool operator()(std::string_view a, std::string_view b) const;
};
using HttpHeaders = std::map<std::string, std::string, HeaderNameOrder>;

struct HttpRequest {
    std::string url;  // http, https or file
    std::string method = "GET";
    HttpHeaders headers;
    Data body;
    std::optional<Duration> timeout;  // total, from resolving to the last byte; the session's own when absent
    std::optional<std::string> sourceApplication{};  // the bundle identifier of the application that the traffic is for
};

struct HttpResponse {
    int status = 0;  // 0 when there is no HTTP response; that of one which broke off comes with the error
    HttpHeaders headers{};
    std::optional<Data> body{};  // absent when none arrived
    MaybeError error{};          // of the transport
};

class HttpSession {
public:
    virtual ~HttpSession() = default;
    // Answers once, on a worker, never on the calling thread and never on the one that moves the bytes.
    virtual void send(HttpRequest request, OnceCallback<HttpResponse> completion) = 0;
};

class HttpSessions {
public:
    virtual ~HttpSessions() = default;
    // The process-wide session, with ordinary caching.
    virtual HttpSession& shared() = 0;
    // A new session whose requests reload from the origin, whatever is cached. It may be let go at once: what it has
    // under way ends as it would have.
    virtual std::shared_ptr<HttpSession> makeUncached() = 0;
};

}  // namespace vrx::platform
