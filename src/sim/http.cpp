#include "vrx/sim/http.h"

#include <limits>
#include <utility>

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

class HttpSessions::Session final : public platform::HttpSession {
public:
    Session(HttpSessions& sessions, bool isShared) : sessions_(sessions), isShared_(isShared) {}
    void send(HttpRequest request, platform::OnceCallback<HttpResponse> completion) override {
        sessions_.send(isShared_, std::move(request), std::move(completion));
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

void HttpSessions::send(bool isShared, HttpRequest request, platform::OnceCallback<HttpResponse> completion) {
    interference_.call();
    HttpAnswer answer = answerTo(request);
    Duration limit = request.timeout.value_or(defaultTimeout);
    if (answer.delay >= limit) answer = transportError(timedOut, "the request timed out").after(limit);
    if (interference_.strikes(Defect::AnswerLost)) answer = HttpAnswer::silence();
    sent_.push_back({std::move(request), isShared, clock_.now()});
    queues_.workers(platform::Priority::UserInitiated)
        .postAfter(answer.delay, [response = std::move(answer.response), completion = std::move(completion)]() mutable {
            completion(std::move(response));
        });
}

HttpAnswer HttpSessions::answerTo(const HttpRequest& request) {
    std::optional<platform::Url> url = platform::Url::parse(request.url);
    if (!url) return transportError(unreadable, "no URL");
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
