#include "vrx/host/http/http.h"

#include <csignal>
#include <cstdio>
#include <future>
#include <map>

#include "host/http/loopback_server.h"
#include "host/support.h"
#include "support/eventually.h"
#include "vrx/host/http/transfer_line.h"
#include "vrx/host/loop/queues.h"

namespace vrx::host {
namespace {

using platform::HttpRequest;
using platform::HttpResponse;
using ::testing::Not;

std::string redirectTo(const std::string& url) {
    return answer("302 Found", "moved", "Location: " + url + "\r\n");
}

// 10,001 times the letter x, by gzip.
constexpr std::string_view packed(
    "\x1f\x8b\x08\x00\x00\x00\x00\x00\x02\xff\xed\xc1\x01\x0d\x00\x00\x00\xc2\xa0\xda\x8f\x6f\x0f\x07\x14\x00\x00\x00"
    "\x00\x00\x00\x00\x00\x00\x1c\x18\x75\xb1\x0e\xc3\x11\x27\x00\x00",
    44);

HttpRequest requestTo(std::string url, std::string method = "GET", std::optional<Duration> timeout = {}) {
    return {.url = std::move(url), .method = std::move(method), .headers = {}, .body = {}, .timeout = timeout};
}

class HttpTest : public InFolder {
protected:
    HttpResponse fetch(HttpRequest request) { return fetch(http.shared(), std::move(request)); }
    HttpResponse fetch(platform::HttpSession& session, HttpRequest request) {
        return begin(session, std::move(request)).get();
    }
    static std::future<HttpResponse> begin(platform::HttpSession& session, HttpRequest request) {
        std::promise<HttpResponse> response;
        std::future<HttpResponse> future = response.get_future();
        session.send(std::move(request),
                     [p = std::move(response)](HttpResponse arrived) mutable { p.set_value(std::move(arrived)); });
        return future;
    }
    HttpResponse get(const std::string& url) { return fetch(requestTo(url)); }

    static std::string body(const HttpResponse& response) {
        return response.body ? std::string(response.body->begin(), response.body->end()) : "(none)";
    }
    // The status is that of an answer which has begun.
    static std::string error(const HttpResponse& response, int status = 0) {
        EXPECT_EQ(response.status, status);
        EXPECT_FALSE(response.body);
        return response.error ? response.error->text : "(none)";
    }

    std::vector<std::string> requests;  // as the test's server notes them
    MainLoop loop;
    Queues queues{loop, 2};
    SettableClock clock;
    DeviceProfile profile{folder / "device.toml"};
    platform::Queue& workers = queues.workers(platform::Priority::UserInitiated);
    HttpSessions http{workers, clock, profile, {.timeout = 10s, .answerBytes = 10'000}};
};

TEST_F(HttpTest, CarriesRequestAndAnswerAndReusesTheConnection) {
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
    EXPECT_THAT(requests[1], Not(HasSubstr("Source-Application")));
    writeFile(profile.layers().front(), "[http]\nsource_application_header = true");
    HttpRequest named = requestTo(server.url());
    named.sourceApplication = "com.example.app";
    fetch(named);
    EXPECT_THAT(requests[2], HasSubstr("\r\nX-Orvane-Source-Application: com.example.app\r\n"));

    request.headers = {{"X-A", "1\r\nX-Forged: 2"}};
    EXPECT_THAT(error(fetch(request)), HasSubstr("header"));
    EXPECT_EQ(requests.size(), 3u);
}

TEST_F(HttpTest, BoundsTheAnswerAlsoAfterDecompression) {
    LoopbackServer server([&](const std::string& request) {
        if (request.starts_with("GET /fits")) return answer("200 OK", std::string(10'000, 'x'));
        if (request.starts_with("GET /packed"))
            return answer("200 OK", std::string(packed), "Content-Encoding: gzip\r\n");
        return answer("200 OK", std::string(10'001, 'x'));
    });
    EXPECT_EQ(body(get(server.url("/fits"))).size(), 10'000u);
    EXPECT_EQ(error(get(server.url("/large")), 200), "the answer is too large");
    EXPECT_EQ(error(get(server.url("/packed")), 200), "the answer is too large");
}

TEST_F(HttpTest, FollowsFiveRedirectsOfAGetWithoutItsHeadersAndNoneOfAPost) {
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

TEST_F(HttpTest, SpeaksPlainHttpWithThisMachineOnlyAndReadsFilesOfBoundedSize) {
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
    writeFile(folder / "large", std::string(10'001, 'x'));
    EXPECT_EQ(error(get("file://" + folder / "large")), "the file is too large");
}

TEST_F(HttpTest, ReachesOtherMachinesByTheProxyOfTheEnvironment) {
    LoopbackServer proxy([&](const std::string& request) {
        requests.push_back(request.substr(0, request.find("\r\n")));
        return answer("502 Bad Gateway", "");
    });
    const std::string url = "https://0.0.0.0:1/";  // no other machine, but as good as one
    for (const char* name : {"HTTPS_PROXY", "no_proxy", "NO_PROXY"}) unsetenv(name);  // whatever this machine has
    for (const char* name : {"https_proxy", "ALL_PROXY"}) {
        setenv(name, proxy.url().c_str(), 1);
        EXPECT_THAT(error(get(url)), HasSubstr("502")) << name;
        setenv("no_proxy", "0.0.0.0", 1);
        EXPECT_THAT(error(get(url)), HasSubstr("connect to 0.0.0.0 port 1")) << name;
        unsetenv("no_proxy");
        unsetenv(name);
    }
    EXPECT_EQ(requests, std::vector<std::string>(2, "CONNECT 0.0.0.0:1 HTTP/1.1"));
}

TEST_F(HttpTest, KeepsNothingThatIsDoubtful) {
    std::string next;
    LoopbackServer server([&](const std::string& request) {
        requests.push_back(request);
        return next;
    });
    const std::string fresh = "Cache-Control: max-age=60\r\nETag: \"a\"\r\n";
    const HttpRequest plain = requestTo(server.url()), posted = requestTo(server.url(), "POST");
    HttpRequest ranged = plain, typed = plain;
    ranged.headers["Range"] = "bytes=0-1";
    typed.headers["Accept"] = "text/plain";
    const std::pair<HttpRequest, std::string> cases[] = {
        {plain, answer("404 Not Found", "x", fresh)},
        {plain, answer("206 Partial Content", "x", fresh)},
        {plain, "HTTP/1.0 200 OK\r\n" + fresh + "\r\nof unknown length"},
        {plain, "HTTP/1.0 200 OK\r\nContent-Length: 99\r\n" + fresh + "\r\ncut short"},
        {plain, answer("200 OK", std::string(10'001, 'x'), fresh)},
        {ranged, answer("200 OK", "x", fresh)},
        {posted, answer("200 OK", "x", fresh)},
        {typed, answer("200 OK", "x", fresh)},
    };
    for (const auto& [request, first] : cases) {
        next = first;
        fetch(request);
        next = answer("200 OK", "new");
        EXPECT_EQ(body(fetch(plain)), "new") << first;
        EXPECT_THAT(requests.back(), Not(HasSubstr("If-None-Match"))) << first;
    }
    EXPECT_EQ(body(fetch(typed)), "new");
}

TEST_F(HttpTest, TrustsTheProfilesAuthorityWhileTheProfileIsTrusted) {
    const std::string program =
        VRX_PROGRAMS "/vrx-coverage-server --tls --fault server-version:redirect=http://127.0.0.1/";
    FILE* server = popen(("exec 2>/dev/null; echo process $$; exec " + program).c_str(), "r");
    std::array<char, 1000> process, certificate, url;
    ASSERT_EQ(fscanf(server, "process %999s control on %*s certificate %999s listening on %999s", process.data(),
                     certificate.data(), url.data()),
              3);
    setenv("https_proxy", "http://proxy.invalid:1", 1);  // not for this machine
    EXPECT_THAT(error(get(url.data())), HasSubstr("certificate"));
    writeFile(profile.layers().front(), "[http]\nca_file = '" + std::string(certificate.data()) + "'");
    folder.setMode("device.toml", 0600);
    EXPECT_EQ(get(url.data()).status, 404);
    EXPECT_EQ(error(get(url.data() + std::string("/library/ORVANE/asset/vrxV2.plist"))), "a redirect leaves https");
    folder.setMode("device.toml", 0666);
    EXPECT_THAT(error(get(url.data())), HasSubstr("certificate"));
    kill(std::stoi(process.data()), SIGTERM);
    pclose(server);
}

TEST_F(HttpTest, NamesTheLibraryThatItCannotOpen) {
    writeFile(folder / "libcurl.so.4", "no library");
    setenv("LD_LIBRARY_PATH", folder.path().c_str(), 1);  // heeded by a process that begins
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    auto tellError = [this] {
        std::fputs(error(get("https://localhost")).c_str(), stderr);
        std::filesystem::remove_all(folder.path());
        _exit(0);
    };
    EXPECT_EXIT(tellError(), ::testing::ExitedWithCode(0), "libcurl.so.4");
    unsetenv("LD_LIBRARY_PATH");
}

// The first request of each connection is answered, the next one finds the connection closed.
TEST_F(HttpTest, SendsOnceWhatCannotBeRepeated) {
    std::map<std::string, int> sent;
    LoopbackServer server([&](const std::string& request) {
        const std::string method = request.substr(0, request.find(' '));
        ++sent[method];
        return requests.empty() ? answer("200 OK", "x") : std::string("HTTP/1.0");  // no answer, and the end
    });
    for (const char* method : {"POST", "GET"}) {
        requests.clear();
        sent.clear();
        EXPECT_EQ(fetch(requestTo(server.url(), method)).status, 200);
        requests.emplace_back("break");
        const HttpResponse response = fetch(requestTo(server.url(), method));
        EXPECT_TRUE(response.error) << method;
        EXPECT_LE(sent[method], method == std::string("POST") ? 2 : 3);
    }
    LoopbackServer closing([](const std::string&) { return "HTTP/1.0 200 OK\r\nContent-Length: 1\r\n\r\nx"; });
    for (int i = 0; i < 5; ++i) EXPECT_EQ(fetch(requestTo(closing.url(), "POST")).status, 200);
}

TEST_F(HttpTest, LetsTransfersWaitForTheirTurn) {
    const platform::ShutdownScope shutdown;  // nobody answers
    codec::HttpCache cache(clock, 1000);
    const auto add = [&](TransferLine& line, const char* host, Requester requester, const HttpLimits& limits) {
        const RequesterScope scope(requester);
        line.add(std::make_unique<HttpTransfer>(requestTo(std::string("https://") + host + "/x"), false,
                                                HttpSurroundings{limits, profile, cache}, [](HttpResponse) {}));
    };
    const HttpLimits one{.transfers = 1}, three{.transfers = 3, .transfersPerHost = 1, .longestWait = 0s};
    TransferLine line(one);
    for (const char* host : {"a1", "a2", "a3"}) add(line, host, 1000, one);
    for (const char* host : {"b1", "b2"}) add(line, host, 1001, one);
    add(line, "own", std::nullopt, one);
    std::vector<std::string> order;
    while (const auto transfer = line.next()) {
        order.push_back(transfer->host());
        EXPECT_FALSE(line.next());
        line.ended(*transfer);
    }
    EXPECT_THAT(order, ElementsAre("own", "a1", "b1", "a2", "b2", "a3"));
    TransferLine hosts(three);
    for (const char* host : {"h", "h", "h", "k"}) add(hosts, host, 1000, three);
    const auto first = hosts.next(), second = hosts.next();
    EXPECT_EQ(first->host() + second->host(), "hk");
    EXPECT_FALSE(hosts.next());
    hosts.ended(*first);
    EXPECT_EQ(hosts.next()->host(), "h");
    EXPECT_EQ(hosts.removeOverdue(std::chrono::steady_clock::now()).size(), 1u);
    EXPECT_FALSE(hosts.firstOverdue());

    LoopbackServer server([](const std::string&) { return answer("200 OK", "x"); });
    HttpSessions impatient(workers, clock, profile, {.transfersPerHost = 1, .longestWait = 10ms});
    LoopbackServer silent([](const std::string&) { return std::string(); });
    auto held = begin(impatient.shared(), requestTo(silent.url(), "GET", 10s));
    eventually([&] { return silent.connections() == 1; }, "the one that is held");
    EXPECT_THAT(error(fetch(impatient.shared(), requestTo(silent.url()))), HasSubstr("too many requests"));
    EXPECT_EQ(fetch(impatient.shared(), requestTo(server.url())).status, 200) << "another host";
    impatient.stop();
    EXPECT_THROW(held.get(), std::future_error);
}

TEST_F(HttpTest, AnswersRequestsAtOnceAndLetsGoOfThoseUnderWayAtItsEnd) {
    LoopbackServer server([](const std::string& request) {
        return request.starts_with("GET /silent") ? std::string() : answer("200 OK", "x");
    });
    std::future<HttpResponse> unanswered = begin(*http.makeUncached(), requestTo(server.url("/silent")));
    std::vector<std::future<HttpResponse>> responses;
    for (int i = 0; i < 40; ++i) responses.push_back(begin(http.shared(), requestTo(server.url())));
    for (auto& response : responses) EXPECT_EQ(response.get().status, 200);
    http.stop();
    EXPECT_THROW(unanswered.get(), std::future_error) << "let go";
    http.shared().send(requestTo(server.url()), [](HttpResponse) { FAIL(); });
}

}  // namespace
}  // namespace vrx::host
