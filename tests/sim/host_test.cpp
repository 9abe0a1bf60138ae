// The simulated facilities: scripted answers and faults, and what is recorded of their use.
#include "vrx/sim/host.h"

#include <cerrno>

#include "support/values.h"

namespace vrx::sim {
namespace {

using platform::HttpRequest;
using platform::HttpResponse;

class SimHttp : public testing::Test {
protected:
    void send(platform::HttpSession& session, HttpRequest request) {
        session.send(std::move(request), [this](HttpResponse response) {
            EXPECT_EQ(host.queues.currentLabel(), "userInitiated");
            std::string answer = response.error ? response.error->text : std::to_string(response.status);
            if (response.body) answer += ":" + std::string(response.body->begin(), response.body->end());
            answers.emplace_back(answer, host.clock.elapsed());
        });
    }
    void get(const std::string& url) { send(host.http.shared(), requestTo(url)); }
    static HttpRequest requestTo(const std::string& url, std::optional<Duration> timeout = {}) {
        return {.url = url, .headers = {}, .body = {}, .timeout = timeout};
    }
    std::vector<std::string> texts() const {
        std::vector<std::string> texts;
        for (const auto& [text, time] : answers) texts.push_back(text);
        return texts;
    }

    Host host;
    std::vector<std::pair<std::string, Duration>> answers;
};

TEST_F(SimHttp, AnswersAsLaidDownOnceBeforeStanding) {
    host.http.answer("http://a/", HttpAnswer::ok("standing"));
    host.http.answerOnce("http://a/", HttpAnswer::status(401));
    host.http.answerOnce("http://a/", HttpAnswer::failure("reset"));
    for (int i = 0; i < 4; ++i) {
        get("http://a/");
        EXPECT_EQ(answers.size(), static_cast<std::size_t>(i)) << "answers come later";
        host.runFor(1s);
    }
    host.http.answer("http://a/", [](const HttpRequest& request) { return HttpAnswer::ok("to " + request.method); });
    get("http://a/");
    get("http://b/");
    get("no url");
    host.runFor(1s);
    EXPECT_THAT(texts(), ElementsAre("401:", "reset", "200:standing", "200:standing", "200:to GET",
                                     "connection refused", "no URL"));
}

TEST_F(SimHttp, HonoursDelaysAndTimeouts) {
    host.http.answer("http://slow/", HttpAnswer::ok("x").after(45s));
    host.http.answer("http://silent/", HttpAnswer::silence());
    send(host.http.shared(), requestTo("http://slow/", 30s));
    get("http://slow/");
    get("http://silent/");
    host.runFor(2min);
    using Answer = std::pair<std::string, Duration>;
    EXPECT_THAT(answers, ElementsAre(Answer("the request timed out", 30s), Answer("200:x", 45s),
                                     Answer("the request timed out", 60s)));
}

TEST_F(SimHttp, RecordsWhatWasSent) {
    host.runFor(5s);
    HttpRequest request = requestTo("http://a/");
    request.body = {'b'};
    send(host.http.shared(), request);
    get("http://b/");
    ASSERT_EQ(host.http.sentTo("http://a/").size(), 1u);
    EXPECT_EQ(host.http.sentTo("http://a/")[0].body(), "b");
    EXPECT_EQ(host.http.sentTo("http://a/")[0].date, Clock::start + 5s);
    // Unanswered at the end, which is no failure.
}

TEST(SimFiles, FailAsScriptedAndKeepTheOldContent) {
    Host host;
    std::string path = host.files.homeDirectory() + "/a";
    host.files.put(path, "old");
    host.files.fail(Files::Operation::Replace, ENOSPC, 2);
    host.files.fail(Files::Operation::Read, EIO);
    EXPECT_EQ(host.files.replace(path, Data{'1'})->code, ENOSPC);
    EXPECT_EQ(host.files.replace(path, Data{'2'})->code, ENOSPC);
    EXPECT_EQ(host.files.read(path).error().code, EIO);

    host.files.crashNextReplace();
    EXPECT_TRUE(host.files.replace(path, Data{'3'}));
    EXPECT_EQ(host.files.content(path), "old");
    EXPECT_EQ(host.files.paths().size(), 2u) << "what was to replace it lies beside it";
    EXPECT_THAT(host.files.written(), IsEmpty());

    EXPECT_FALSE(host.files.replace(path, Data{'4'}));
    EXPECT_EQ(host.files.content(path), "4");
    EXPECT_THAT(host.files.written(), ElementsAre(path));
}

TEST(SimDefaults, FailAndInterfereAsScripted) {
    Host host;
    host.defaults.set("key", 1);
    host.defaults.failWrites(2);
    host.defaults.set("key", 2);
    host.defaults.update("key", [](const Value&) { return 3; });
    EXPECT_EQ(host.defaults.get("key"), Value(1));
    EXPECT_EQ(host.log.messages(platform::Level::Error).size(), 2u);

    host.defaults.interfereWithNextUpdate(10);
    host.defaults.update("key", [](const Value& value) { return *value.asInteger() + 1; });
    EXPECT_EQ(host.defaults.get("key"), Value(11));
    EXPECT_THAT(host.defaults.writes(), ElementsAre("key", "key", "key", "key"));

    std::vector<std::string> failures;
    host.failures.handler = [&](const std::string& text) { failures.push_back(text); };
    host.defaults.update("key", [&](const Value&) { return host.defaults.get("other"); });
    EXPECT_EQ(failures.size(), 1u) << "the function uses the store";
}

TEST(SimListener, AsksTheDelegateAndReportsAConnectionThatServesNothing) {
    struct : platform::ServiceListenerDelegate {
        bool shouldAcceptNewConnection(platform::ServiceListener&, platform::ServiceConnection& connection) override {
            if (isAccepting) connection.resume();
            return isAccepting;
        }
        bool isAccepting = true;
    } delegate;
    Host host;
    std::vector<std::string> failures;
    host.failures.handler = [&](const std::string& text) { failures.push_back(text); };
    auto listener = host.listener.makeListener("name");
    listener->setDelegate(&delegate);
    EXPECT_EQ(host.listener.connect(7, {}), nullptr) << "before resume()";
    listener->resume();
    EXPECT_THAT(failures, IsEmpty());
    EXPECT_EQ(host.listener.connect(7, {}), nullptr);
    EXPECT_EQ(failures.size(), 1u) << "resumed, but nothing is exported";
    delegate.isAccepting = false;
    EXPECT_EQ(host.listener.connect(7, {}), nullptr);
    EXPECT_EQ(failures.size(), 1u) << "refused";
}

}  // namespace
}  // namespace vrx::sim
