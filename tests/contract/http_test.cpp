// What the HTTP sessions of every host answer, simulated or real. The real ones talk to a server on loopback.
#include "vrx/host/http/http.h"
#include <functional>
#include <sstream>
#include <tuple>

#include "contract/hosts.h"
#include "host/http/loopback_server.h"
#include "vrx/codec/line_text.h"
#include "vrx/platform/url.h"

namespace vrx {
namespace {

using platform::HttpResponse;
using platform::Priority;

// What a server says: status, headers as lines, body. Asked with the headers that ask about what is kept, a line each.
using Said = std::tuple<int, std::string, std::string>;
using Server = std::function<Said(const std::string& conditions)>;

class SimulatedHttp : public SimulatedHost {
public:
    SimulatedHttp() {
        sim::HttpAnswer found = sim::HttpAnswer::ok("content");
        found.response.headers["X-Name"] = "value";
        host.http.answer(url("/found"), found);
        host.http.answer(url("/empty"), sim::HttpAnswer::ok(""));
        host.http.answer(url("/missing"), sim::HttpAnswer::status(404, "not here"));
        host.http.answer(url("/silent"), sim::HttpAnswer::silence());
    }
    platform::HttpSessions& sessions() { return host.http; }
    bool isOnWorker() const { return !host.queues.currentLabel().empty(); }
    std::string url(const std::string& path) const { return "http://127.0.0.1" + path; }
    std::string refusingUrl() const { return "http://127.0.0.1:1/"; }
    void setServer(const Server& server) {
        host.http.answer(url("/said"), [server](const platform::HttpRequest& request) {
            std::string conditions;
            for (const auto& [name, value] : request.headers)
                if (name.starts_with("If-")) conditions += name + ": " + value + "\r\n";
            const auto [status, headers, body] = server(conditions);
            sim::HttpAnswer answer = sim::HttpAnswer::status(status, body);
            std::istringstream lines(headers);
            for (std::string line; std::getline(lines, line);) {
                std::string& value = answer.response.headers[line.substr(0, line.find(':'))];
                value += (value.empty() ? "" : ", ") + std::string(codec::trimmed(line.substr(line.find(':') + 1)));
            }
            return answer;
        });
    }
    void passSeconds(double seconds) { host.clock.set(host.clock.now() + Duration(seconds)); }
    std::string fileUrl(const std::string& name, std::string_view content) {
        host.files.put("/folder/" + name, content);
        return platform::Url::forFile("/folder/" + name).text();
    }
};

class RealHttp : public RealHost {
public:
    platform::HttpSessions& sessions() { return sessions_; }
    bool isOnWorker() const { return std::this_thread::get_id() != body_; }
    std::string url(const std::string& path) const { return server_.url(path); }
    std::string refusingUrl() const {
        return host::LoopbackServer([](const auto&) { return ""; }).url();
    }
    void setServer(const Server& server) { said_ = server; }
    void passSeconds(double seconds) { clock_.seconds = clock_.seconds + seconds; }
    std::string fileUrl(const std::string& name, std::string_view content) {
        host::writeFile(folder / name, content);
        return platform::Url::forFile(folder / name).text();
    }

private:
    std::string served(const std::string& request) const {
        if (request.starts_with("GET /found ")) return host::answer("200 OK", "content", "x-name: value\r\n");
        if (request.starts_with("GET /empty ")) return host::answer("200 OK", "");
        if (request.starts_with("GET /missing ")) return host::answer("404 Not Found", "not here");
        return request.find(" /said ") == request.npos ? "" : said(request);
    }
    std::string said(const std::string& request) const {
        std::string conditions;
        for (std::size_t at = 0; (at = request.find("\r\nIf-", at)) != request.npos; at += 2)
            conditions += request.substr(at + 2, request.find("\r\n", at + 2) - at);
        const auto [status, headers, body] = said_(conditions);
        if (status == 304) return "HTTP/1.1 304 Not Modified\r\n" + headers + "\r\n";
        return host::answer(std::to_string(status) + " Said", body, headers);
    }

    const std::thread::id body_ = std::this_thread::get_id();
    Server said_;
    host::LoopbackServer server_{[this](const std::string& request) { return served(request); }};
    host::SettableClock clock_;
    host::HttpSessions sessions_{queues().workers(Priority::UserInitiated), clock_, profile};
};

template <class Host>
class HttpContract : public ContractTest<Host> {
protected:
    HttpResponse answerTo(const std::string& url, std::optional<Duration> timeout = {}, const char* method = "GET") {
        const std::shared_ptr<platform::HttpSession> notOwned(&this->host.sessions().shared(), [](auto*) {});
        return answerOf(notOwned, url, timeout, method);
    }
    static std::string bodyOf(const HttpResponse& answer) {
        const Data body = answer.body.value_or(Data{});
        return {body.begin(), body.end()};
    }
    // Of a session that is let go at once, unless the caller keeps it.
    HttpResponse answerOf(std::shared_ptr<platform::HttpSession> session, const std::string& url,
                          std::optional<Duration> timeout = {}, const char* method = "GET") {
        HttpResponse answer;
        auto answered = this->host.queues().makeEvent();
        session->send({.url = url, .method = method, .headers = {}, .body = {}, .timeout = timeout},
                      [&, answered](HttpResponse response) {
                          EXPECT_TRUE(this->host.isOnWorker());
                          answer = std::move(response);
                          answered->set();
                      });
        session.reset();
        answered->wait();
        return answer;
    }
    static void expectTransportError(const HttpResponse& answer) {
        EXPECT_EQ(answer.status, 0);
        EXPECT_FALSE(answer.body);
        ASSERT_TRUE(answer.error);
        EXPECT_FALSE(answer.error->text.empty());
    }
};

using HttpHosts = testing::Types<SimulatedHttp, RealHttp>;
TYPED_TEST_SUITE(HttpContract, HttpHosts, HostNames);

TYPED_TEST(HttpContract, GivesStatusHeadersAndBodyWhateverTheStatus) {
    HttpResponse found = this->answerTo(this->host.url("/found"));
    EXPECT_EQ(found.headers["X-NAME"], "value");
    HttpResponse empty = this->answerTo(this->host.url("/empty"));
    empty.body = empty.body.value_or(Data{});  // it may also have none
    const HttpResponse missing = this->answerTo(this->host.url("/missing"));
    for (const auto& [answer, status, body] :
         {std::tuple(found, 200, "content"), {missing, 404, "not here"}, {empty, 200, ""}}) {
        EXPECT_EQ(answer.status, status);
        EXPECT_EQ(answer.body, host::bytes(body));
        EXPECT_EQ(answer.error, std::nullopt);
    }
}

TYPED_TEST(HttpContract, GivesATransportErrorWhereNothingAnswers) {
    for (const std::string& url :
         {this->host.refusingUrl(), std::string(), std::string("no url"), std::string("unknown://scheme/")})
        this->expectTransportError(this->answerTo(url));
    this->expectTransportError(this->answerTo(this->host.url("/silent"), 20ms));
}

TYPED_TEST(HttpContract, ReadsLocalFiles) {
    HttpResponse answer = this->answerTo(this->host.fileUrl("a b%.plist", "content"));
    EXPECT_EQ(answer.status, 0);
    EXPECT_EQ(answer.body, host::bytes("content"));
    EXPECT_EQ(answer.error, std::nullopt);
    this->expectTransportError(this->answerTo(this->host.fileUrl("there", "") + "/not"));
    this->expectTransportError(this->answerTo("file://elsewhere/etc/hosts"));
}

TYPED_TEST(HttpContract, KeepsAnswersAsTheirHeadersAllow) {
    const std::string url = this->host.url("/said");
    const std::string tagged = "If-None-Match: \"a\"\r\n";
    const std::string dated = "If-Modified-Since: Sun, 06 Nov 1994 08:00:00 GMT\r\n";
    // What the first answer says, how much later the second request comes, and how it asks whether that still holds:
    // empty for not, null when it does not go out.
    const std::tuple<std::string, double, std::optional<std::string>> cases[] = {
        {"Cache-Control: max-age=60", 59, {}},
        {"Cache-Control: max-age=60", 61, ""},
        {"Cache-Control: max-age=60\r\nAge: 10", 51, ""},
        {"Cache-Control: max-age=60", -1, ""},  // the clock was set back
        {"Cache-Control: max-age=60\r\nETag: \"a\"", 61, tagged},
        {"Cache-Control: no-cache, max-age=60\r\nETag: \"a\"", 0, tagged},
        {"Cache-Control: max-age=60\r\ncache-control: no-store\r\nETag: \"a\"", 0, ""},
        {"ETag: \"a\", \"b\"", 0, ""},
        {"Last-Modified: Sun, 06 Nov 1994 08:00:00 GMT", 0, dated},
        {"Expires: 0\r\nLast-Modified: Sun, 06 Nov 1994 08:00:00 GMT", 0, dated},
        {"Cache-Control: max-age=60\r\nVary: Accept-Encoding, X-Other", 1, {}},
        {"Cache-Control: max-age=60\r\nVary: Accept, *", 1, ""},
        {"X-None: 1", 0, ""},
    };
    for (const auto& [said, secondsLater, condition] : cases) {
        SCOPED_TRACE(said);
        std::vector<std::string> asked;
        this->host.setServer([&, headers = said + "\r\n"](const std::string& conditions) {
            asked.push_back(conditions);
            return conditions.empty() ? Said(200, headers, std::to_string(asked.size()))
                                      : Said(304, "X-New: 1\r\nCache-Control: max-age=60\r\n", "");
        });
        this->answerTo(url, {}, "POST");  // nothing is left of the case before
        asked.clear();
        EXPECT_EQ(this->bodyOf(this->answerTo(url)), "1");
        this->host.passSeconds(secondsLater);
        const bool isConfirmed = !condition.value_or("").empty();
        HttpResponse second = this->answerTo(url);
        EXPECT_EQ(this->bodyOf(second), condition && !isConfirmed ? "2" : "1");
        EXPECT_EQ(second.status, 200);
        EXPECT_EQ(asked.size(), condition ? 2u : 1u);
        EXPECT_EQ(asked.back(), condition.value_or(""));
        if (!isConfirmed) continue;
        EXPECT_EQ(second.headers["X-New"], "1");
        EXPECT_TRUE(this->answerTo(url).headers.contains("Age")) << "it is fresh anew";
        EXPECT_EQ(asked.size(), 2u);
    }
}

TYPED_TEST(HttpContract, KeepsTheNewestAnswerOnly) {
    const std::string url = this->host.url("/said");
    Said next;
    std::vector<std::string> asked;
    this->host.setServer([&](const std::string& conditions) {
        asked.push_back(conditions);
        return next;
    });
    const auto fresh = [](const char* body) { return Said(200, "Cache-Control: max-age=60\r\nETag: \"a\"\r\n", body); };
    const auto fetched = [&](const Said& said) {
        next = said;
        return this->bodyOf(this->answerTo(url));
    };
    EXPECT_EQ(fetched({404, "Cache-Control: max-age=60\r\n", "none"}), "none");
    EXPECT_EQ(fetched(fresh("1")), "1");
    next = fresh("2");
    EXPECT_EQ(this->bodyOf(this->answerOf(this->host.sessions().makeUncached(), url)), "2");
    EXPECT_EQ(fetched(fresh("3")), "2") << "the reload has taken its place";
    this->answerTo(url, {}, "POST");
    EXPECT_EQ(fetched(next), "3") << "it was changed";
    this->host.passSeconds(61);
    EXPECT_EQ(fetched({500, "", "broken"}), "broken");
    asked.clear();
    fetched({304, "ETag: \"b\"\r\n", ""});  // of another answer
    EXPECT_THAT(asked, testing::ElementsAre("If-None-Match: \"a\"\r\n", ""));
}

TYPED_TEST(HttpContract, EndsWhatASessionThatWasLetGoHadUnderWay) {
    const auto kept = this->host.sessions().makeUncached();
    EXPECT_EQ(this->answerOf(kept, this->host.url("/found")).status, 200);
    EXPECT_EQ(this->answerOf(this->host.sessions().makeUncached(), this->host.url("/found")).status, 200);
}

}  // namespace
}  // namespace vrx
