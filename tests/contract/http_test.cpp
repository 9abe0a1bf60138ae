// What the HTTP sessions of every host answer, simulated or real. The real ones talk to a server on loopback.
#include "vrx/host/http/http.h"
#include "contract/hosts.h"
#include "host/http/loopback_server.h"
#include "vrx/host/profile/clock.h"
#include "vrx/platform/url.h"

namespace vrx {
namespace {

using platform::HttpResponse;
using platform::Priority;

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
    std::string fileUrl(const std::string& name, std::string_view content) {
        host::writeFile(folder / name, content);
        return platform::Url::forFile(folder / name).text();
    }

private:
    static std::string served(const std::string& request) {
        if (request.starts_with("GET /found ")) return host::answer("200 OK", "content", "x-name: value\r\n");
        if (request.starts_with("GET /empty ")) return host::answer("200 OK", "");
        if (request.starts_with("GET /missing ")) return host::answer("404 Not Found", "not here");
        return "";
    }

    const std::thread::id body_ = std::this_thread::get_id();
    host::LoopbackServer server_{served};
    host::Clock clock_{profile};
    host::HttpSessions sessions_{queues().workers(Priority::UserInitiated), clock_, profile};
};

template <class Host>
class HttpContract : public ContractTest<Host> {
protected:
    HttpResponse answerTo(const std::string& url, std::optional<Duration> timeout = {}) {
        const std::shared_ptr<platform::HttpSession> notOwned(&this->host.sessions().shared(), [](auto*) {});
        return answerOf(notOwned, url, timeout);
    }
    // Of a session that is let go at once, unless the caller keeps it.
    HttpResponse answerOf(std::shared_ptr<platform::HttpSession> session, const std::string& url,
                          std::optional<Duration> timeout = {}) {
        HttpResponse answer;
        auto answered = this->host.queues().makeEvent();
        session->send({.url = url, .headers = {}, .body = {}, .timeout = timeout},
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

TYPED_TEST(HttpContract, EndsWhatASessionThatWasLetGoHadUnderWay) {
    const auto kept = this->host.sessions().makeUncached();
    EXPECT_EQ(this->answerOf(kept, this->host.url("/found")).status, 200);
    EXPECT_EQ(this->answerOf(this->host.sessions().makeUncached(), this->host.url("/found")).status, 200);
}

}  // namespace
}  // namespace vrx
