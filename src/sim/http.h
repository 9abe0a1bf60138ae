// HTTP with scripted answers. A test scripts the answer at a URL and afterwards reads what was sent. A URL without an
// answer refuses connections, as all do without a network; a file URL reads the simulated files. Answers arrive on a
// worker, after their delay in virtual time.
//
// As on a real host, the shared session keeps answers as their headers allow, for as long as the process lives; an
// uncached one does not use them, but stores its own answer in their place. Redirects are not followed.
#pragma once

#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/codec/http_cache.h"
#include "vrx/platform/http_request.h"
#include "vrx/platform/limits.h"
#include "vrx/sim/clock.h"
#include "vrx/sim/files.h"
#include "vrx/sim/interference.h"
#include "vrx/sim/queues.h"

namespace vrx::sim {

struct HttpAnswer {
    platform::HttpResponse response;
    platform::Duration delay{0.1};
    bool isTransferred = false;  // set by the sessions: it comes from a server, and not from what is kept

    static HttpAnswer ok(std::string_view body) { return status(200, body); }
    static HttpAnswer status(int status, std::string_view body = {});
    // The transport fails.
    static HttpAnswer failure(std::string text = "connection lost");
    // No answer ever comes, so the request times out.
    static HttpAnswer silence();

    HttpAnswer after(platform::Duration time) const {
        HttpAnswer answer = *this;
        answer.delay = time;
        return answer;
    }
};

struct SentRequest {
    platform::HttpRequest request;  // as the server saw it, with what asks about a kept answer
    bool isShared;                  // through the shared session; otherwise through one that bypasses caches
    platform::Date date;            // when it was sent
    int status;                     // of the answer that follows; 0 when none does
    std::string_view cause;         // Queues::cause() at that moment
    std::string_view body() const { return {reinterpret_cast<const char*>(request.body.data()), request.body.size()}; }
};

class HttpSessions final : public platform::HttpSessions {
public:
    static constexpr platform::Duration defaultTimeout{60};

    HttpSessions(const Clock& clock, Queues& queues, const Files& files, const Interference& interference);

    platform::HttpSession& shared() override { return *shared_; }
    std::shared_ptr<platform::HttpSession> makeUncached() override;

    using Server = std::function<HttpAnswer(const platform::HttpRequest&)>;
    // Sets the standing answer at a URL.
    void answer(std::string url, HttpAnswer answer);
    void answer(std::string url, Server server) { standing_[std::move(url)] = std::move(server); }
    // Answers that come before the standing one, each once, in the order in which they were set.
    void answerOnce(std::string url, HttpAnswer answer) { once_[std::move(url)].push_back(std::move(answer)); }

    void setNetworkAvailable(bool isNetworkAvailable) { isNetworkAvailable_ = isNetworkAvailable; }
    // What the process had kept ends with it.
    void processEnded() { cache_.clear(); }

    // All requests that left the device, and those for files, in the order in which they were sent. What was kept is
    // answered without one.
    const std::vector<SentRequest>& sent() const { return sent_; }
    void forgetSent() { sent_.clear(); }
    std::vector<SentRequest> sentTo(std::string_view url) const;

private:
    class Session;

    struct Exchange;

    void send(Exchange exchange);
    HttpAnswer transferred(const Exchange& exchange);
    bool hasLeft(const platform::HttpRequest& request) const;
    void arrive(Exchange exchange, HttpAnswer answer);
    HttpAnswer answerTo(const platform::HttpRequest& request);
    HttpAnswer fileAnswer(const std::string& path) const;

    const Clock& clock_;
    Queues& queues_;
    const Files& files_;
    const Interference& interference_;
    std::shared_ptr<platform::HttpSession> shared_;
    std::map<std::string, Server> standing_;
    std::map<std::string, std::deque<HttpAnswer>> once_;
    std::vector<SentRequest> sent_;
    codec::HttpCache cache_{clock_, platform::limits::storedAnswerBytes};
    bool isNetworkAvailable_ = true;
};

}  // namespace vrx::sim
