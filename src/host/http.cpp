#include "host/http.h"

#include <curl/curl.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <climits>
#include <csignal>
#include <map>
#include <mutex>
#include <system_error>
#include <thread>
#include <vector>

#include "host/files.h"
#include "platform/url.h"

namespace vrx::host {

using platform::Data;
using platform::Duration;
using platform::Error;
using platform::HttpHeaders;
using platform::HttpRequest;
using platform::HttpResponse;
using platform::MaybeError;
using platform::OnceCallback;
using platform::Url;

namespace {

using Completion = OnceCallback<HttpResponse>;
using SteadyClock = std::chrono::steady_clock;

constexpr std::size_t headerBytes = 256 * 1024;

Error transportError(int code, std::string text) {
    return Error{"http", code, std::move(text)};
}

HttpResponse failure(Error error) {
    return {.status = 0, .headers = {}, .body = std::nullopt, .error = std::move(error)};
}

HttpResponse success(int status, HttpHeaders headers, Data body) {
    std::optional<Data> arrived;
    if (!body.empty()) arrived.emplace(std::move(body));
    return {.status = status, .headers = std::move(headers), .body = std::move(arrived), .error = std::nullopt};
}

struct Freed {
    void operator()(CURL* easy) const { curl_easy_cleanup(easy); }
    void operator()(CURLU* url) const { curl_url_cleanup(url); }
    void operator()(curl_slist* list) const { curl_slist_free_all(list); }
    void operator()(char* text) const { curl_free(text); }
};

std::string urlPart(CURLU* url, CURLUPart part) {
    char* text = nullptr;
    if (curl_url_get(url, part, &text, 0) != CURLUE_OK) return "";
    return std::unique_ptr<char, Freed>(text).get();
}

bool isLoopback(const std::string& host) {
    return host == "localhost" || host == "[::1]" ||
           (host.starts_with("127.") && std::ranges::count(host, '.') == 3 &&
            host.find_first_not_of("0123456789.") == std::string::npos);
}

// What a header of a request may consist of: nothing that could end it and begin another.
bool isSafeHeader(const std::string& name, const std::string& value) {
    constexpr std::string_view marks = "!#$%&'*+-.^_`|~";
    auto isNameCharacter = [&](char c) {
        return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') ||
               marks.find(c) != marks.npos;
    };
    return !name.empty() && std::ranges::all_of(name, isNameCharacter) &&
           value.find_first_of(std::string_view("\r\n\0", 3)) == value.npos;
}

std::string_view trimmed(std::string_view text) {
    constexpr std::string_view blanks = " \t\r\n";
    const std::size_t begin = text.find_first_not_of(blanks);
    if (begin == text.npos) return {};
    return text.substr(begin, text.find_last_not_of(blanks) + 1 - begin);
}

SteadyClock::time_point deadlineAfter(Duration timeout) {
    // A day is as good as for ever, and no number is no time.
    constexpr Duration longest = std::chrono::hours(24);
    const Duration bounded = timeout < longest ? timeout : longest;
    return SteadyClock::now() + std::chrono::ceil<SteadyClock::duration>(bounded > Duration(0) ? bounded : Duration(0));
}

// One request on its way, over all of its redirects. Belongs to the transfer thread once it is there.
class Transfer {
public:
    Transfer(HttpRequest request, bool isUncached, const HttpLimits& limits, Completion completion)
        : request_(std::move(request)),
          isUncached_(isUncached),
          limits_(limits),
          deadline_(deadlineAfter(request_.timeout.value_or(limits.timeout))),
          completion_(std::move(completion)) {}

    CURL* easy() const { return easy_.get(); }
    Completion takeCompletion() { return std::move(completion_); }

    // Makes ready for the next address, the request's own or a redirect's; an error if it must not be asked.
    MaybeError prepare();
    // Whether the answer, which has arrived without an error, was a redirect that is to be followed: then prepare() is
    // next. An error when it must not be.
    platform::Result<bool> redirect();
    HttpResponse response(CURLcode result);

private:
    MaybeError checkAddress(const std::string& address, bool& isPlain) const;
    MaybeError setHeaders();
    void setBody();
    template <class T>
    void set(CURLoption option, T value) {
        curl_easy_setopt(easy_.get(), option, value);
    }

    static std::size_t onHeader(char* bytes, std::size_t one, std::size_t size, void* self);
    static std::size_t onBody(char* bytes, std::size_t one, std::size_t size, void* self);

    HttpRequest request_;
    const bool isUncached_;
    const HttpLimits& limits_;
    const SteadyClock::time_point deadline_;
    Completion completion_;

    std::unique_ptr<CURL, Freed> easy_;
    std::unique_ptr<curl_slist, Freed> headerList_;
    std::array<char, CURL_ERROR_SIZE> errorText_{};
    std::string redirectedTo_;
    int redirects_ = 0;

    HttpHeaders headers_;
    std::size_t headerSize_ = 0;
    Data body_;
    const char* tooLarge_ = nullptr;
};

MaybeError Transfer::checkAddress(const std::string& address, bool& isPlain) const {
    std::unique_ptr<CURLU, Freed> url(curl_url());
    if (curl_url_set(url.get(), CURLUPART_URL, address.c_str(), CURLU_NON_SUPPORT_SCHEME) != CURLUE_OK)
        return transportError(CURLE_URL_MALFORMAT, "the URL is malformed");
    const std::string scheme = urlPart(url.get(), CURLUPART_SCHEME);
    isPlain = scheme == "http";
    if (!isPlain && scheme != "https")
        return transportError(CURLE_UNSUPPORTED_PROTOCOL, "the scheme " + scheme + " is not supported");
    if (isPlain && !isLoopback(urlPart(url.get(), CURLUPART_HOST)))
        return transportError(CURLE_UNSUPPORTED_PROTOCOL, "plain http is for this machine only; use https");
    return std::nullopt;
}

MaybeError Transfer::prepare() {
    const std::string& address = redirects_ > 0 ? redirectedTo_ : request_.url;
    bool isPlain;
    if (MaybeError error = checkAddress(address, isPlain)) return error;

    if (!easy_) easy_.reset(curl_easy_init());
    if (!easy_) return transportError(CURLE_OUT_OF_MEMORY, "out of memory");
    curl_easy_reset(easy_.get());  // keeps the connections
    headers_.clear();
    headerSize_ = 0;
    body_.clear();
    errorText_[0] = 0;

    set(CURLOPT_PRIVATE, this);
    set(CURLOPT_URL, address.c_str());
    set(CURLOPT_PROTOCOLS_STR, "http,https");
    set(CURLOPT_NOSIGNAL, 1L);
    set(CURLOPT_QUICK_EXIT, 1L);  // a slow resolver is left behind, or the time-out would wait for it
    set(CURLOPT_ERRORBUFFER, errorText_.data());
    set(CURLOPT_HEADERFUNCTION, &Transfer::onHeader);
    set(CURLOPT_HEADERDATA, this);
    set(CURLOPT_WRITEFUNCTION, &Transfer::onBody);
    set(CURLOPT_WRITEDATA, this);
    set(CURLOPT_ACCEPT_ENCODING, "");
    // What goes to this machine does not leave it through a proxy.
    if (isPlain) set(CURLOPT_NOPROXY, "*");
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline_ - SteadyClock::now()).count();
    set(CURLOPT_TIMEOUT_MS, static_cast<long>(std::max<decltype(left)>(left, 1)));
    setBody();
    return setHeaders();
}

void Transfer::setBody() {
    if (request_.method == "GET" && request_.body.empty()) return;
    if (request_.method == "HEAD") return set(CURLOPT_NOBODY, 1L);
    set(CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(request_.body.size()));
    set(CURLOPT_POSTFIELDS, request_.body.empty() ? "" : reinterpret_cast<const char*>(request_.body.data()));
    if (request_.method != "POST") set(CURLOPT_CUSTOMREQUEST, request_.method.c_str());
}

MaybeError Transfer::setHeaders() {
    headerList_.reset();
    auto add = [this](const std::string& line) {
        headerList_.reset(curl_slist_append(headerList_.release(), line.c_str()));
    };
    // What the library would add to a body of its own accord.
    add("Expect:");
    if (!request_.headers.contains("Content-Type")) add("Content-Type:");
    if (isUncached_ && !request_.headers.contains("Cache-Control")) add("Cache-Control: no-cache");
    if (redirects_ == 0) {
        for (const auto& [name, value] : request_.headers) {
            if (!isSafeHeader(name, value))
                return transportError(CURLE_BAD_FUNCTION_ARGUMENT, "a header of the request is malformed");
            add(trimmed(value).empty() ? name + ";" : name + ": " + value);
        }
    }
    set(CURLOPT_HTTPHEADER, headerList_.get());
    return std::nullopt;
}

std::size_t Transfer::onHeader(char* bytes, std::size_t, std::size_t size, void* self) {
    auto& transfer = *static_cast<Transfer*>(self);
    const std::string_view line = trimmed({bytes, size});
    // Each status line begins the headers anew: of an interim answer, or of a proxy's.
    if (line.starts_with("HTTP/")) transfer.headers_.clear();
    transfer.headerSize_ += size;
    if (transfer.headerSize_ > headerBytes) {
        transfer.tooLarge_ = "the answer's headers are too large";
        return 0;
    }
    const std::size_t colon = line.find(':');
    if (colon == 0 || colon == line.npos) return size;
    const std::string_view value = trimmed(line.substr(colon + 1));
    auto [entry, isNew] = transfer.headers_.try_emplace(std::string(line.substr(0, colon)), value);
    if (!isNew) entry->second.append(", ").append(value);
    return size;
}

std::size_t Transfer::onBody(char* bytes, std::size_t, std::size_t size, void* self) {
    auto& transfer = *static_cast<Transfer*>(self);
    if (size > transfer.limits_.answerBytes - transfer.body_.size()) {
        transfer.tooLarge_ = "the answer is too large";
        return 0;
    }
    transfer.body_.insert(transfer.body_.end(), bytes, bytes + size);
    return size;
}

platform::Result<bool> Transfer::redirect() {
    const char* location = nullptr;
    curl_easy_getinfo(easy_.get(), CURLINFO_REDIRECT_URL, &location);
    if (!location || (request_.method != "GET" && request_.method != "HEAD")) return false;
    if (redirects_ == limits_.redirects) return transportError(CURLE_TOO_MANY_REDIRECTS, "too many redirects");
    const std::string& from = redirects_ > 0 ? redirectedTo_ : request_.url;
    bool wasPlain, isPlain;
    if (checkAddress(from, wasPlain)) return false;
    std::string to = location;
    if (MaybeError error = checkAddress(to, isPlain)) return *error;
    if (isPlain && !wasPlain) return transportError(CURLE_UNSUPPORTED_PROTOCOL, "a redirect leaves https");
    redirectedTo_ = std::move(to);
    ++redirects_;
    return true;
}

HttpResponse Transfer::response(CURLcode result) {
    if (tooLarge_) return failure(transportError(CURLE_FILESIZE_EXCEEDED, tooLarge_));
    if (result != CURLE_OK)
        return failure(transportError(result, errorText_[0] ? errorText_.data() : curl_easy_strerror(result)));
    long status = 0;
    curl_easy_getinfo(easy_.get(), CURLINFO_RESPONSE_CODE, &status);
    return success(static_cast<int>(status), std::move(headers_), std::move(body_));
}

}  // namespace

// The transfer thread and what is under way on it.
class HttpTransfers {
public:
    HttpTransfers(platform::Queue& answers, const HttpLimits& limits) : answers_(answers), limits_(limits) {}
    ~HttpTransfers() { stop(); }

    void send(HttpRequest request, bool isUncached, Completion completion);
    void stop();

private:
    void sendFile(const Url& url, Completion completion);
    bool start();
    void run();
    void begin(std::unique_ptr<Transfer> transfer);
    void finishEnded();
    void answer(Completion completion, HttpResponse response);

    platform::Queue& answers_;
    const HttpLimits limits_;

    std::mutex mutex_;
    std::vector<std::unique_ptr<Transfer>> sent_;  // not begun yet
    bool isStopping_ = false;
    std::thread thread_;
    CURLM* multi_ = nullptr;

    std::map<Transfer*, std::unique_ptr<Transfer>> running_;  // the transfer thread's
};

void HttpTransfers::send(HttpRequest request, bool isUncached, Completion completion) {
    if (std::optional<Url> url = Url::parse(request.url); url && url->isFile())
        return sendFile(*url, std::move(completion));
    auto transfer = std::make_unique<Transfer>(std::move(request), isUncached, limits_, std::move(completion));
    std::unique_lock lock(mutex_);
    if (isStopping_) {
        lock.unlock();
        transfer->takeCompletion().letGo();
        return;
    }
    if (!start()) {
        lock.unlock();
        return answer(transfer->takeCompletion(), failure(transportError(CURLE_FAILED_INIT, "cannot begin")));
    }
    sent_.push_back(std::move(transfer));
    curl_multi_wakeup(multi_);
}

// Read here and not by the library, which could wait for ever on what is no regular file.
void HttpTransfers::sendFile(const Url& url, Completion completion) {
    answers_.post([path = url.filePath(), limit = limits_.answerBytes, completion = std::move(completion)]() mutable {
        if (!path) return completion(failure(transportError(CURLE_URL_MALFORMAT, "the URL names no local file")));
        platform::Result<FileContent> content = readFile(*path);
        if (!content) return completion(failure(content.error()));
        if (content->bytes.size() > limit)
            return completion(failure(transportError(CURLE_FILESIZE_EXCEEDED, "the file is too large")));
        completion(success(0, {}, std::move(content).value().bytes));
    });
}

bool HttpTransfers::start() {
    if (multi_) return true;
    static const CURLcode isReady = curl_global_init(CURL_GLOBAL_DEFAULT);
    if (isReady != CURLE_OK || !(multi_ = curl_multi_init())) return false;
    curl_multi_setopt(multi_, CURLMOPT_MAXCONNECTS, 8L);
    try {
        thread_ = std::thread([this] { run(); });
    } catch (const std::system_error&) {
        curl_multi_cleanup(std::exchange(multi_, nullptr));
        return false;
    }
    return true;
}

void HttpTransfers::stop() {
    platform::ShutdownScope shutdown;
    {
        std::lock_guard lock(mutex_);
        if (std::exchange(isStopping_, true)) return;
        if (multi_) curl_multi_wakeup(multi_);
    }
    if (thread_.joinable()) thread_.join();
    sent_.clear();
    for (auto& [transfer, owned] : running_) curl_multi_remove_handle(multi_, transfer->easy());
    running_.clear();
    curl_multi_cleanup(multi_);
}

void HttpTransfers::run() {
    // Writing to a connection that the server has closed is an error and nothing more.
    sigset_t brokenPipe;
    sigemptyset(&brokenPipe);
    sigaddset(&brokenPipe, SIGPIPE);
    pthread_sigmask(SIG_BLOCK, &brokenPipe, nullptr);

    while (true) {
        std::vector<std::unique_ptr<Transfer>> sent;
        {
            std::lock_guard lock(mutex_);
            if (isStopping_) return;
            sent.swap(sent_);
        }
        for (auto& transfer : sent) begin(std::move(transfer));
        int running = 0;
        curl_multi_perform(multi_, &running);
        finishEnded();
        // Wakes for bytes, for the library's own timers, and for a new request: never otherwise.
        curl_multi_poll(multi_, nullptr, 0, INT_MAX, nullptr);
    }
}

void HttpTransfers::begin(std::unique_ptr<Transfer> transfer) {
    if (MaybeError error = transfer->prepare()) return answer(transfer->takeCompletion(), failure(std::move(*error)));
    curl_multi_add_handle(multi_, transfer->easy());
    Transfer* key = transfer.get();
    running_.emplace(key, std::move(transfer));
}

void HttpTransfers::finishEnded() {
    int left = 0;
    while (CURLMsg* message = curl_multi_info_read(multi_, &left)) {
        if (message->msg != CURLMSG_DONE) continue;
        const CURLcode result = message->data.result;
        Transfer* ended = nullptr;
        curl_easy_getinfo(message->easy_handle, CURLINFO_PRIVATE, &ended);
        curl_multi_remove_handle(multi_, ended->easy());
        std::unique_ptr<Transfer> transfer = std::move(running_.extract(ended).mapped());

        platform::Result<bool> isRedirect = result == CURLE_OK ? transfer->redirect() : false;
        if (!isRedirect)
            answer(transfer->takeCompletion(), failure(isRedirect.error()));
        else if (*isRedirect)
            begin(std::move(transfer));
        else
            answer(transfer->takeCompletion(), transfer->response(result));
    }
}

void HttpTransfers::answer(Completion completion, HttpResponse response) {
    answers_.post([completion = std::move(completion), response = std::move(response)]() mutable {
        completion(std::move(response));
    });
}

namespace {

class Session final : public platform::HttpSession {
public:
    Session(std::shared_ptr<HttpTransfers> transfers, bool isUncached)
        : transfers_(std::move(transfers)), isUncached_(isUncached) {}
    void send(HttpRequest request, Completion completion) override {
        transfers_->send(std::move(request), isUncached_, std::move(completion));
    }

private:
    const std::shared_ptr<HttpTransfers> transfers_;
    const bool isUncached_;
};

}  // namespace

HttpSessions::HttpSessions(platform::Queue& answers, const HttpLimits& limits)
    : transfers_(std::make_shared<HttpTransfers>(answers, limits)),
      shared_(std::make_unique<Session>(transfers_, false)) {}

HttpSessions::~HttpSessions() {
    stop();
}

void HttpSessions::stop() {
    transfers_->stop();
}

std::shared_ptr<platform::HttpSession> HttpSessions::makeUncached() {
    return std::make_shared<Session>(transfers_, true);
}

}  // namespace vrx::host
