#include "vrx/sim/http.h"

#include <limits>
#include <utility>

#include "vrx/codec/http_cache_rules.h"
#include "vrx/platform/url.h"

namespace vrx::sim {

using platform::Data;
using platform::Duration;
using platform::Error;
using platform::HttpRequest;
using platform::HttpResponse;

namespace {

HttpAnswer transportError(int code, std::string text) {
    HttpAnswer answer;
    answer.response.error = Error{platform::error_domain::http, code, std::move(text)};
    return answer;
}

constexpr int lost = 1;
constexpr int refused = 2;
constexpr int timedOut = 3;
constexpr int unreadable = 4;

}  // namespace

HttpAnswer HttpAnswer::status(int status, std::string_view body) {
    HttpAnswer answer;
    answer.response.status = status;
    answer.response.body = Data(body.begin(), body.end());
    return answer;
}

HttpAnswer HttpAnswer::failure(std::string text) {
    return transportError(lost, std::move(text));
}

HttpAnswer HttpAnswer::silence() {
    return HttpAnswer().after(Duration(std::numeric_limits<double>::infinity()));
}

// A request on its way, and the kept answer about which it asks.
struct HttpSessions::Exchange {
    bool isShared = false;
    HttpRequest request{};
    platform::OnceCallback<HttpResponse> completion{};
    codec::HttpCache::Stored stored{};
    platform::Date asked{};

    // Whether it may be answered by what is kept: headers of its own could name an account.
    bool isCached() const { return request.method == "GET" && request.body.empty() && request.headers.empty(); }
};

class HttpSessions::Session final : public platform::HttpSession {
public:
    Session(HttpSessions& sessions, bool isShared) : sessions_(sessions), isShared_(isShared) {}
    void send(HttpRequest request, platform::OnceCallback<HttpResponse> completion) override {
        sessions_.interference_.call();
        sessions_.send({.isShared = isShared_, .request = std::move(request), .completion = std::move(completion)});
    }

private:
    HttpSessions& sessions_;
    const bool isShared_;
};

HttpSessions::HttpSessions(const Clock& clock, Queues& queues, const Files& files, const Interference& interference)
    : clock_(clock),
      queues_(queues),
      files_(files),
      interference_(interference),
      shared_(std::make_shared<Session>(*this, true)) {}

std::shared_ptr<platform::HttpSession> HttpSessions::makeUncached() {
    return std::make_shared<Session>(*this, false);
}

void HttpSessions::answer(std::string url, HttpAnswer answer) {
    standing_[std::move(url)] = [answer = std::move(answer)](const HttpRequest&) { return answer; };
}

std::vector<SentRequest> HttpSessions::sentTo(std::string_view url) const {
    std::vector<SentRequest> requests;
    for (const SentRequest& sent : sent_)
        if (sent.request.url == url) requests.push_back(sent);
    return requests;
}

void HttpSessions::send(Exchange exchange) {
    exchange.asked = clock_.now();
    exchange.stored = exchange.isShared && exchange.isCached() ? cache_.find(exchange.request.url) : nullptr;
    std::optional<HttpResponse> kept = exchange.stored ? cache_.freshAnswer(*exchange.stored) : std::nullopt;
    HttpAnswer answer = kept ? HttpAnswer{*std::move(kept), Duration(0)} : transferred(exchange);
    if (interference_.strikes(Defect::AnswerLost)) answer = HttpAnswer::silence();
    const Duration delay = answer.delay;
    queues_.workers(platform::Priority::UserInitiated)
        .postAfter(delay, [this, exchange = std::move(exchange), answer = std::move(answer)]() mutable {
            arrive(std::move(exchange), std::move(answer));
        });
}

// What becomes of it on its way to the server and back, within the time that it has.
HttpAnswer HttpSessions::transferred(const Exchange& exchange) {
    HttpRequest request = exchange.request;
    if (exchange.stored) request.headers.merge(codec::revalidationHeaders(exchange.stored->answer.headers));
    HttpAnswer answer = answerTo(request);
    const Duration limit = request.timeout.value_or(defaultTimeout);
    if (answer.delay >= limit) answer = transportError(timedOut, "the request timed out").after(limit);
    answer.isTransferred = true;
    if (hasLeft(request))
        sent_.push_back(
            {std::move(request), exchange.isShared, exchange.asked, answer.response.status, queues_.cause()});
    return answer;
}

// Without a network nothing leaves the device.
bool HttpSessions::hasLeft(const HttpRequest& request) const {
    return isNetworkAvailable_ || request.url.starts_with("file:");
}

// Handles what has come from a server as the real host does: the confirmation of what is kept, and a final answer.
void HttpSessions::arrive(Exchange exchange, HttpAnswer answer) {
    HttpResponse& response = answer.response;
    const std::string& url = exchange.request.url;
    if (!answer.isTransferred || response.error) return exchange.completion(std::move(response));
    if (exchange.stored && response.status == 304) {
        if (codec::isConfirmed(exchange.stored->answer.headers, response.headers))
            return exchange.completion(cache_.revalidated(*exchange.stored, exchange.asked, response.headers));
        cache_.forget(url);
        return send(std::move(exchange));
    }
    if (exchange.isCached() && response.status == 200) cache_.store(url, exchange.asked, response);
    // A successful change makes what is kept of the address out of date.
    const bool isChange = exchange.request.method != "GET" && exchange.request.method != "HEAD";
    if (isChange && response.status < 400) cache_.forget(url);
    exchange.completion(std::move(response));
}

HttpAnswer HttpSessions::answerTo(const HttpRequest& request) {
    std::optional<platform::Url> url = platform::Url::parse(request.url);
    if (!url) return transportError(unreadable, "no URL");
    if (!hasLeft(request)) return transportError(lost, "there is no network");
    if (std::deque<HttpAnswer>& answers = once_[request.url]; !answers.empty()) {
        HttpAnswer answer = std::move(answers.front());
        answers.pop_front();
        return answer;
    }
    if (auto server = standing_.find(request.url); server != standing_.end()) return server->second(request);
    if (url->isFile()) return fileAnswer(url->filePath().value_or(""));
    return transportError(refused, "connection refused");
}

HttpAnswer HttpSessions::fileAnswer(const std::string& path) const {
    platform::Result<Data> content = files_.read(path);
    if (!content) return transportError(unreadable, content.error().text).after(Duration(0));
    HttpAnswer answer;
    answer.response.body = *content;
    return answer.after(Duration(0));
}

}  // namespace vrx::sim
