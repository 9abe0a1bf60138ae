// HTTP on libcurl. One thread, started with the first request, transfers for all sessions; answers are delivered on the
// worker queue. Any thread may use a session. Nothing wakes up while nothing is under way.
//
// TLS is verified, against the system's authorities and those that the profile adds; plain http reaches this machine
// only. A GET follows redirects, which carry none of the request's own headers and never leave https; any other method
// gets the redirect itself as its answer. Headers and bodies are never logged here.
//
// The shared session keeps answers as their headers allow (codec/http_cache.h). An uncached one does not use them, but
// stores its own answer in their place, so that nobody gets an older one afterwards.
//
// A request reaches its server once; only a GET, which changes nothing, is sent a second time after a connection that
// broke before the answer.
#pragma once

#include <memory>

#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/http_request.h"
#include "vrx/platform/limits.h"
#include "vrx/platform/queue.h"

namespace vrx::host {

struct HttpLimits {
    platform::Duration timeout = std::chrono::seconds(60);       // of a request that sets none
    platform::Duration longestTimeout = std::chrono::hours(24);  // of any request
    std::size_t answerBytes = platform::limits::answerBytes;     // after decompression; headers count apart
    int redirects = 5;
    // Transfers at the same time, in all and to one host. The others wait for their turn, and fail after the longest
    // wait; the time of a request begins with its turn.
    std::size_t transfers = platform::limits::transfers;
    std::size_t transfersPerHost = platform::limits::transfersPerHost;
    platform::Duration longestWait = std::chrono::seconds(60);
    std::size_t storedBytes = platform::limits::storedAnswerBytes;  // of all stored answers together
};

class HttpTransfers;

class HttpSessions final : public platform::HttpSessions {
public:
    // The queue, the clock and the profile must outlive the sessions.
    HttpSessions(platform::Queue& answers, const platform::Clock& clock, const DeviceProfile& profile,
                 const HttpLimits& limits = {});
    ~HttpSessions() override;
    // Discards requests under way, and those sent from now on, without an answer.
    void stop();

    platform::HttpSession& shared() override { return *shared_; }
    std::shared_ptr<platform::HttpSession> makeUncached() override;

private:
    std::shared_ptr<HttpTransfers> transfers_;
    std::unique_ptr<platform::HttpSession> shared_;
};

}  // namespace vrx::host
