// The simulated facilities: scripted answers and faults, and what is recorded of their use.
#include "vrx/sim/host.h"

#include <gmock/gmock.h>

#include <cerrno>

namespace vrx::sim {
namespace {

using namespace std::chrono_literals;
using platform::Data;
using platform::HttpRequest;
using platform::HttpResponse;
using platform::Value;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

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
    static HttpRequest requestTo(const std::string& url) {
        HttpRequest request;
        request.url = url;
        return request;
    }
    std::vector<std::string> texts() const {
        std::vector<std::string> texts;
        for (const auto& [text, time] : answers) texts.push_back(text);
        return texts;
    }

    Host host;
    std::vector<std::pair<std::string, platform::Duration>> answers;
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
    HttpRequest impatient = requestTo("http://slow/");
    impatient.timeout = 30s;
    send(host.http.shared(), impatient);
    get("http://slow/");
    get("http://silent/");
    host.runFor(2min);
    using Answer = std::pair<std::string, platform::Duration>;
    EXPECT_THAT(answers, ElementsAre(Answer("the request timed out", 30s), Answer("200:x", 45s),
                                     Answer("the request timed out", 60s)));
}

TEST_F(SimHttp, RecordsWhatWasSent) {
    host.runFor(5s);
    HttpRequest request = requestTo("http://a/");
    request.method = "POST";
    request.headers = {{"X-Name", "value"}};
    request.body = {'b'};
    request.sourceApplication = "com.example.app";
    send(host.http.shared(), request);
    send(*host.http.makeUncached(), requestTo("http://b/"));
    ASSERT_EQ(host.http.sent().size(), 2u);
    ASSERT_EQ(host.http.sentTo("http://a/").size(), 1u);
    const SentRequest& post = host.http.sent()[0];
    EXPECT_EQ(post.request.headers.at("x-name"), "value");
    EXPECT_EQ(post.body(), "b");
    EXPECT_EQ(post.request.sourceApplication, "com.example.app");
    EXPECT_TRUE(post.isShared);
    EXPECT_EQ(post.date, Clock::start + 5s);
    EXPECT_FALSE(host.http.sent()[1].isShared);
    // Unanswered at the end, which is no failure.
}

TEST_F(SimHttp, ReadsFileUrlsFromTheSimulatedFiles) {
    host.files.put("/etc/a b.plist", "content");
    get("file:///etc/a%20b.plist");
    get("file:///etc/missing");
    host.run();
    EXPECT_THAT(texts(), ElementsAre("0:content", HasSubstr("/etc/missing")));
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

    host.defaults.registerDefaults({{"key", 0}, {"other", 0}});
    host.defaults.forgetRegistered();
    EXPECT_EQ(host.defaults.dictionaryRepresentation(), (platform::Dictionary{{"key", 11}}));
}

TEST(SimDefaults, ReportAnUpdateWhoseFunctionUsesTheStore) {
    Host host;
    std::vector<std::string> failures;
    host.failures.handler = [&](const std::string& text) { failures.push_back(text); };
    host.defaults.update("key", [&](const Value&) { return host.defaults.get("other"); });
    EXPECT_EQ(failures.size(), 1u);
}

TEST(SimLog, KeepsLinesForTests) {
    Host host;
    platform::log(platform::Level::Default, "device %{private}@", "S1");
    platform::log(platform::Level::Error, "%@ failed", "it");
    platform::log(platform::Level::Default, "device %{private}@", "S2");
    EXPECT_THAT(host.log.messages(), ElementsAre("device S1", "it failed", "device S2"));
    EXPECT_THAT(host.log.messages(platform::Level::Error), ElementsAre("it failed"));
    EXPECT_EQ(host.log.count("device %{private}@"), 2);
    EXPECT_EQ(host.log.lastMessage("device %{private}@"), "device S2");
    EXPECT_FALSE(host.log.contains("device"));
}

class OnlyEntitled : public platform::ServiceListenerDelegate {
public:
    bool shouldAcceptNewConnection(platform::ServiceListener&, platform::ServiceConnection& connection) override {
        if (connection.valueForEntitlement("entitled") != Value(true)) return false;
        if (connection.processIdentifier() == 7) connection.resume();
        return true;
    }
};

TEST(SimListener, AsksTheDelegateAndReportsAConnectionThatServesNothing) {
    Host host;
    std::vector<std::string> failures;
    host.failures.handler = [&](const std::string& text) { failures.push_back(text); };
    OnlyEntitled delegate;
    auto listener = host.listener.makeListener("name");
    listener->setDelegate(&delegate);
    EXPECT_EQ(host.listener.connect(7, {{"entitled", true}}), nullptr) << "before resume()";
    listener->resume();
    EXPECT_EQ(host.listener.serviceName(), "name");
    EXPECT_EQ(host.listener.connect(7, {}), nullptr);
    EXPECT_THAT(failures, IsEmpty());
    EXPECT_EQ(host.listener.connect(7, {{"entitled", true}}), nullptr);
    EXPECT_EQ(failures.size(), 1u) << "resumed, but nothing is exported";
}

}  // namespace
}  // namespace vrx::sim
