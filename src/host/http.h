// HTTP on libcurl: one thread, begun with the first request, moves the bytes of every session; answers are delivered on
// the worker queue. Sessions may be used from any thread. Nothing wakes up while nothing is under way.
//
// TLS is verified; plain http reaches this machine only. A GET follows redirects, which carry none of the request's own
// headers and never leave https; any other method is answered with the redirect itself.
#pragma once

#include <memory>

#include "platform/http_request.h"
#include "platform/limits.h"
#include "platform/queue.h"

namespace vrx::host {

struct HttpLimits {
    platform::Duration timeout = std::chrono::seconds(60);    // of a request that sets none
    std::size_t answerBytes = platform::limits::answerBytes;  // after decompression; headers count apart
    int redirects = 5;
};

class HttpTransfers;

class HttpSessions final : public platform::HttpSessions {
public:
    // The queue must outlive the sessions.
    explicit HttpSessions(platform::Queue& answers, const HttpLimits& limits = {});
    ~HttpSessions() override;
    // Discards what is under way, and what is sent from now on, unanswered.
    void stop();

    platform::HttpSession& shared() override { return *shared_; }
    std::shared_ptr<platform::HttpSession> makeUncached() override;

private:
    std::shared_ptr<HttpTransfers> transfers_;
    std::unique_ptr<platform::HttpSession> shared_;
};

}  // namespace vrx::host
