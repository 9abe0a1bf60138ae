// What the HTTP sessions of every host answer, simulated or real. The real ones talk to a server on loopback.
#include <gtest/gtest.h>

#include <map>

#include "host/http/loopback_server.h"
#include "host/support.h"
#include "vrx/host/http/http.h"
#include "vrx/host/loop/queues.h"
#include "vrx/host/profile/clock.h"
#include "vrx/platform/url.h"
#include "vrx/sim/host.h"

namespace vrx {
namespace {

using namespace std::chrono_literals;
using platform::Data;
using platform::HttpRequest;
using platform::HttpResponse;
using platform::Priority;

class SimulatedHttp {
public:
    SimulatedHttp() {
        sim::HttpAnswer found = sim::HttpAnswer::ok("content");
        found.response.headers["X-Name"] = "value";
        host_.http.answer(url("/found"), found);
        host_.http.answer(url("/empty"), sim::HttpAnswer::ok(""));
        host_.http.answer(url("/missing"), sim::HttpAnswer::status(404, "not here"));
        host_.http.answer(url("/silent"), sim::HttpAnswer::silence());
    }
    platform::HttpSessions& sessions() { return host_.http; }
    std::shared_ptr<platform::Event> makeEvent() { return host_.queues.makeEvent(); }
    bool isOnWorker() const { return !host_.queues.currentLabel().empty(); }
    std::string url(const std::string& path) const { return "http://127.0.0.1" + path; }
    std::string refusingUrl() const { return "http://127.0.0.1:1/"; }
    std::string fileUrl(const std::string& name, std::string_view content) {
        host_.files.put("/folder/" + name, content);
        return platform::Url::forFile("/folder/" + name).text();
    }

private:
    sim::Host host_;
};

class RealHttp {
public:
    platform::HttpSessions& sessions() { return sessions_; }
    std::shared_ptr<platform::Event> makeEvent() { return queues_.makeEvent(); }
    bool isOnWorker() const { return std::this_thread::get_id() != body_; }
    std::string url(const std::string& path) const { return server_.url(path); }
    std::string refusingUrl() const {
        return host::LoopbackServer([](const auto&) { return ""; }).url();
    }
    std::string fileUrl(const std::string& name, std::string_view content) {
        host::writeFile(folder_ / name, content);
        return platform::Url::forFile(folder_ / name).text();
    }

private:
    static std::string served(const std::string& request) {
        if (request.starts_with("GET /found ")) return host::answer("200 OK", "content", "x-name: value\r\n");
        if (request.starts_with("GET /empty ")) return host::answer("200 OK", "");
        if (request.starts_with("GET /missing ")) return host::answer("404 Not Found", "not here");
        return "";
    }

    const std::thread::id body_ = std::this_thread::get_id();
    host::LogRecorder log_;
    host::TemporaryFolder folder_;
    host::LoopbackServer server_{served};
    host::MainLoop loop_;
    host::Queues queues_{loop_, 2};
    host::DeviceProfile profile_{""};
    host::Clock clock_{profile_};
    host::HttpSessions sessions_{queues_.workers(Priority::UserInitiated), clock_, profile_};
};

template <class Subject>
class HttpContract : public testing::Test {
protected:
    HttpResponse answerTo(const std::string& url, std::optional<platform::Duration> timeout = {}) {
        return answerOf(subject.sessions().shared(), url, timeout);
    }
    HttpResponse answerOf(platform::HttpSession& session, const std::string& url,
                          std::optional<platform::Duration> timeout = {}) {
        HttpRequest request;
        request.url = url;
        request.timeout = timeout;
        HttpResponse answer;
        auto answered = subject.makeEvent();
        session.send(request, [&, answered](HttpResponse response) {
            EXPECT_TRUE(subject.isOnWorker());
            answer = std::move(response);
            answered->set();
        });
        answered->wait();
        return answer;
    }
    static void expectTransportError(const HttpResponse& answer) {
        EXPECT_EQ(answer.status, 0);
        EXPECT_FALSE(answer.body);
        ASSERT_TRUE(answer.error);
        EXPECT_FALSE(answer.error->text.empty());
    }

    Subject subject;
};

struct Names {
    template <class Subject>
    static std::string GetName(int) {
        return std::is_same_v<Subject, SimulatedHttp> ? "Simulated" : "Real";
    }
};
using Subjects = testing::Types<SimulatedHttp, RealHttp>;
TYPED_TEST_SUITE(HttpContract, Subjects, Names);

TYPED_TEST(HttpContract, GivesStatusHeadersAndBodyWhateverTheStatus) {
    HttpResponse found = this->answerTo(this->subject.url("/found"));
    EXPECT_EQ(found.status, 200);
    EXPECT_EQ(found.body, (Data{'c', 'o', 'n', 't', 'e', 'n', 't'}));
    EXPECT_EQ(found.headers["X-NAME"], "value");
    EXPECT_EQ(found.error, std::nullopt);

    HttpResponse missing = this->answerTo(this->subject.url("/missing"));
    EXPECT_EQ(missing.status, 404);
    EXPECT_EQ(missing.body, (Data{'n', 'o', 't', ' ', 'h', 'e', 'r', 'e'}));
    EXPECT_EQ(missing.error, std::nullopt);

    HttpResponse empty = this->answerTo(this->subject.url("/empty"));
    EXPECT_EQ(empty.status, 200);
    EXPECT_EQ(empty.body.value_or(Data{}), Data{});
}

TYPED_TEST(HttpContract, GivesATransportErrorWhereNothingAnswers) {
    this->expectTransportError(this->answerTo(this->subject.refusingUrl()));
    this->expectTransportError(this->answerTo("no url"));
    this->expectTransportError(this->answerTo("unknown://scheme/"));
    this->expectTransportError(this->answerTo(this->subject.url("/silent"), 20ms));
}

TYPED_TEST(HttpContract, ReadsLocalFiles) {
    HttpResponse answer = this->answerTo(this->subject.fileUrl("a b%.plist", "content"));
    EXPECT_EQ(answer.status, 0);
    EXPECT_EQ(answer.body, (Data{'c', 'o', 'n', 't', 'e', 'n', 't'}));
    EXPECT_EQ(answer.error, std::nullopt);
    this->expectTransportError(this->answerTo(this->subject.fileUrl("there", "") + "/not"));
    this->expectTransportError(this->answerTo("file://elsewhere/etc/hosts"));
}

TYPED_TEST(HttpContract, EndsWhatASessionThatWasLetGoHadUnderWay) {
    EXPECT_EQ(this->answerOf(*this->subject.sessions().makeUncached(), this->subject.url("/found")).status, 200);
    auto answered = this->subject.makeEvent();
    HttpRequest request;
    request.url = this->subject.url("/found");
    this->subject.sessions().makeUncached()->send(request, [answered](HttpResponse response) {
        EXPECT_EQ(response.status, 200);
        answered->set();
    });
    answered->wait();
}

}  // namespace
}  // namespace vrx
