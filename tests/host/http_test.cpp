#include "host/http.h"

#include <gmock/gmock.h>

#include <future>

#include "host/queues.h"
#include "loopback_server.h"
#include "support.h"

namespace vrx::host {
namespace {

using namespace std::chrono_literals;
using platform::HttpRequest;
using platform::HttpResponse;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::Not;

std::string redirectTo(const std::string& url) {
    return answer("302 Found", "moved", "Location: " + url + "\r\n");
}

// 10,001 times the letter x, by gzip.
constexpr std::string_view packed(
    "\x1f\x8b\x08\x00\x00\x00\x00\x00\x02\xff\xed\xc1\x01\x0d\x00\x00\x00\xc2\xa0\xda\x8f\x6f\x0f\x07\x14\x00\x00\x00"
    "\x00\x00\x00\x00\x00\x00\x1c\x18\x75\xb1\x0e\xc3\x11\x27\x00\x00",
    44);

HttpRequest requestTo(std::string url, std::string method = "GET", std::optional<platform::Duration> timeout = {}) {
    HttpRequest request;
    request.url = std::move(url);
    request.method = std::move(method);
    request.timeout = timeout;
    return request;
}

class HttpTest : public ::testing::Test {
protected:
    HttpResponse fetch(HttpRequest request) { return fetch(http.shared(), std::move(request)); }
    HttpResponse fetch(platform::HttpSession& session, HttpRequest request) {
        std::promise<HttpResponse> response;
        session.send(std::move(request), [&](HttpResponse arrived) { response.set_value(std::move(arrived)); });
        return response.get_future().get();
    }
    HttpResponse get(const std::string& url) { return fetch(requestTo(url)); }

    static std::string body(const HttpResponse& response) {
        return response.body ? std::string(response.body->begin(), response.body->end()) : "(none)";
    }
    static std::string error(const HttpResponse& response) {
        EXPECT_EQ(response.status, 0);
        EXPECT_FALSE(response.body);
        return response.error ? response.error->text : "(none)";
    }

    LogRecorder log;
    MainLoop loop;
    Queues queues{loop, 2};
    HttpSessions http{queues.workers(platform::Priority::UserInitiated), {.timeout = 10s, .answerBytes = 10'000}};
};

TEST_F(HttpTest, CarriesRequestAndAnswerAndReusesTheConnection) {
    std::vector<std::string> requests;
    LoopbackServer server([&](const std::string& request) {
        requests.push_back(request);
        return "HTTP/1.1 100 Continue\r\nX-Interim: 1\r\n\r\n" +
               answer("404 Not Found", "body", "X-A: 1\r\nx-a:  2 \r\n");
    });
    HttpRequest request = requestTo(server.url("/path?q"), "POST");
    request.body = {'{', '}'};
    request.headers = {{"X-Empty", ""}, {"Content-Type", "application/json"}};
    const HttpResponse response = fetch(request);
    EXPECT_FALSE(response.error);
    EXPECT_EQ(response.status, 404);
    EXPECT_EQ(body(response), "body");
    EXPECT_EQ(response.headers.at("x-a"), "1, 2");
    EXPECT_FALSE(response.headers.contains("X-Interim"));
    const HttpResponse second = fetch(*http.makeUncached(), requestTo(server.url()));
    EXPECT_EQ(second.status, 404);
    EXPECT_EQ(server.connections(), 1);
    EXPECT_THAT(requests[0], ::testing::StartsWith("POST /path?q HTTP/1.1\r\n"));
    EXPECT_THAT(requests[0], HasSubstr("\r\nContent-Type: application/json\r\nX-Empty:"));
    EXPECT_THAT(requests[0], ::testing::EndsWith("\r\n\r\n{}"));
    EXPECT_THAT(requests[0], Not(HasSubstr("Cache-Control")));
    EXPECT_THAT(requests[1], HasSubstr("Cache-Control: no-cache"));

    request.headers = {{"X-A", "1\r\nX-Forged: 2"}};
    EXPECT_THAT(error(fetch(request)), HasSubstr("header"));
    EXPECT_EQ(requests.size(), 2u);
}

TEST_F(HttpTest, BoundsTheAnswerAlsoAfterDecompressionAndItsHeaders) {
    LoopbackServer server([&](const std::string& request) {
        if (request.starts_with("GET /fits")) return answer("200 OK", std::string(10'000, 'x'));
        if (request.starts_with("GET /packed"))
            return answer("200 OK", std::string(packed), "Content-Encoding: gzip\r\n");
        if (request.starts_with("GET /headers"))
            return answer("200 OK", "", "X: " + std::string(300'000, 'x') + "\r\n");
        return answer("200 OK", std::string(10'001, 'x'));
    });
    EXPECT_EQ(body(get(server.url("/fits"))).size(), 10'000u);
    EXPECT_EQ(error(get(server.url("/large"))), "the answer is too large");
    EXPECT_EQ(error(get(server.url("/packed"))), "the answer is too large");
    EXPECT_NE(error(get(server.url("/headers"))), "(none)");
}

TEST_F(HttpTest, EndsWhatTakesTooLongIsRefusedOrBreaksOff) {
    LoopbackServer server([](const std::string& request) {
        return request.starts_with("GET /cut") ? "HTTP/1.1 200 OK\r\nContent-Length: 9\r\nConnection: close\r\n\r\nabc"
                                               : std::string();
    });
    EXPECT_THAT(error(fetch(requestTo(server.url(), "GET", 100ms))), HasSubstr("timed out"));
    HttpSessions impatient(queues.workers(platform::Priority::Background), {.timeout = 100ms});
    EXPECT_THAT(error(fetch(impatient.shared(), requestTo(server.url("/cut")))), HasSubstr("timed out"));

    const int unused = socket(AF_INET, SOCK_STREAM, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t size = sizeof address;
    ASSERT_EQ(bind(unused, reinterpret_cast<sockaddr*>(&address), size), 0);
    getsockname(unused, reinterpret_cast<sockaddr*>(&address), &size);
    EXPECT_NE(error(get("http://127.0.0.1:" + std::to_string(ntohs(address.sin_port)))), "(none)");
    ::close(unused);
}

TEST_F(HttpTest, FollowsFiveRedirectsOfAGetWithoutItsHeadersAndNoneOfAPost) {
    std::vector<std::string> requests;
    LoopbackServer server([&](const std::string& request) {
        requests.push_back(request);
        const int left = request[request.find('/') + 1] - '0';
        return left == 0 ? answer("200 OK", "arrived") : redirectTo("/" + std::to_string(left - 1));
    });
    HttpRequest request = requestTo(server.url("/5"));
    request.headers = {{"X-Account", "secret"}};
    EXPECT_EQ(body(fetch(request)), "arrived");
    ASSERT_EQ(requests.size(), 6u);
    EXPECT_THAT(requests[0], HasSubstr("X-Account: secret"));
    for (std::size_t i = 1; i < 6; ++i) EXPECT_THAT(requests[i], Not(HasSubstr("X-Account")));
    EXPECT_EQ(error(get(server.url("/6"))), "too many redirects");
    requests.clear();
    EXPECT_EQ(fetch(requestTo(server.url("/1"), "POST")).status, 302);
    EXPECT_EQ(requests.size(), 1u);
}

TEST_F(HttpTest, SpeaksPlainHttpWithThisMachineOnlyAndReadsFiles) {
    std::string target;
    LoopbackServer server([&](const std::string&) { return redirectTo(target); });
    setenv("http_proxy", "http://proxy.invalid:1", 1);  // not for this machine
    for (const char* url : {"http://example.com/", "http://127.0.0.1.example.com/", "http://127.0.0.1@example.com/",
                            "http://0.0.0.0/", "http://[::2]/"}) {
        EXPECT_EQ(error(get(url)), "plain http is for this machine only; use https") << url;
        target = url;
        EXPECT_EQ(error(get(server.url())), "plain http is for this machine only; use https") << url;
    }
    target = "file:///etc/hostname";
    EXPECT_EQ(error(get(server.url())), "the scheme file is not supported");
    EXPECT_EQ(error(get("ftp://localhost/")), "the scheme ftp is not supported");
    EXPECT_NE(error(get("")), "(none)");

    TemporaryFolder folder;
    writeFile(folder / "a b", "content");
    EXPECT_EQ(body(get("file://" + folder / "a%20b")), "content");
    EXPECT_NE(error(get("file://" + folder / "absent")), "(none)");
    writeFile(folder / "large", std::string(10'001, 'x'));
    EXPECT_EQ(error(get("file://" + folder / "large")), "the file is too large");
}

TEST_F(HttpTest, AnswersRequestsAtOnceAndLetsGoOfThoseUnderWayAtItsEnd) {
    LoopbackServer server([](const std::string& request) {
        return request.starts_with("GET /silent") ? std::string() : answer("200 OK", "x");
    });
    std::promise<void> unanswered;  // broken when let go
    auto future = unanswered.get_future();
    http.makeUncached()->send(requestTo(server.url("/silent")), [p = std::move(unanswered)](HttpResponse) {});
    std::vector<std::future<HttpResponse>> responses;
    for (int i = 0; i < 40; ++i) {
        std::promise<HttpResponse> response;
        responses.push_back(response.get_future());
        http.shared().send(requestTo(server.url()),
                           [p = std::move(response)](HttpResponse r) mutable { p.set_value(std::move(r)); });
    }
    for (auto& response : responses) EXPECT_EQ(response.get().status, 200);
    http.stop();
    EXPECT_THROW(future.get(), std::future_error);
    http.shared().send(requestTo(server.url()), [](HttpResponse) { FAIL(); });
}

}  // namespace
}  // namespace vrx::host
