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
    std::optional<Duration>
        timeout;  // for the whole exchange, from name resolution to the last byte; null: the session's own
    std::optional<std::string> sourceApplication{};  // the bundle identifier of the application that the traffic is for
};

struct HttpResponse {
    int status = 0;  // 0 without an HTTP response; a response that broke off has its status and an error
    HttpHeaders headers{};
    std::optional<Data> body{};  // null when none arrived
    MaybeError error{};          // the transport's failure
};

class HttpSession {
public:
    virtual ~HttpSession() = default;
    // Answers once, on a worker: never on the calling thread, nor on the thread that moves the bytes.
    virtual void send(HttpRequest request, OnceCallback<HttpResponse> completion) = 0;
};

class HttpSessions {
public:
    virtual ~HttpSessions() = default;
    // The process-wide session, with ordinary caching.
    virtual HttpSession& shared() = 0;
    // A new session whose requests reload from the origin, whatever is cached. The caller may release it at once:
    // requests under way still complete.
    virtual std::shared_ptr<HttpSession> makeUncached() = 0;
};

}  // namespace vrx::platform
