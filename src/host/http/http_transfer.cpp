#include "vrx/host/http/http_transfer.h"

#include <string.h>

#include <algorithm>

#include "vrx/codec/http_cache_rules.h"
#include "vrx/host/base/secret.h"
#include "vrx/host/base/text.h"

namespace vrx::host {

using platform::Data;
using platform::Duration;
using platform::Error;
using platform::HttpHeaders;
using platform::HttpRequest;
using platform::HttpResponse;
using platform::MaybeError;

namespace {

constexpr std::size_t headerBytes = 256 * 1024;

struct UrlFreed {
    void operator()(CURLU* url) const { curl().urlCleanup(url); }
    void operator()(char* text) const { curl().free(text); }
};

std::string urlPart(CURLU* url, CURLUPart part) {
    char* text = nullptr;
    if (curl().urlGet(url, part, &text, 0) != CURLUE_OK) return "";
    return std::unique_ptr<char, UrlFreed>(text).get();
}

bool isLoopback(const std::string& host) {
    return host == "localhost" || host == "[::1]" ||
           (host.starts_with("127.") && std::ranges::count(host, '.') == 3 &&
            host.find_first_not_of("0123456789.") == std::string::npos);
}

// Whether the header stays one line: nothing in it can begin another.
bool isSafeHeader(const std::string& name, const std::string& value) {
    return isHeaderName(name) && value.find_first_of(std::string_view("\r\n\0", 3)) == value.npos;
}

// Of any address, also of one that will be refused. A host that is spelled in two ways counts as two.
std::string hostOf(const std::string& address) {
    const std::size_t scheme = address.find("://");
    const std::size_t begin = scheme == address.npos ? 0 : scheme + 3;
    return address.substr(begin, address.find_first_of("/?#", begin) - begin);
}

}  // namespace

Error httpError(int code, std::string text) {
    return Error{platform::error_domain::http, code, std::move(text)};
}

HttpResponse httpFailure(Error error) {
    return {.status = 0, .headers = {}, .body = std::nullopt, .error = std::move(error)};
}

HttpResponse httpSuccess(int status, HttpHeaders headers, Data body) {
    std::optional<Data> arrived;
    if (!body.empty()) arrived.emplace(std::move(body));
    return {.status = status, .headers = std::move(headers), .body = std::move(arrived), .error = std::nullopt};
}

void HttpTransfer::Freed::operator()(curl_slist* list) const {
    for (curl_slist* line = list; line; line = line->next) explicit_bzero(line->data, strlen(line->data));
    curl().slistFreeAll(list);
}

HttpTransfer::HttpTransfer(HttpRequest request, bool isUncached, HttpSurroundings surroundings, Completion completion)
    : request_(std::move(request)),
      isUncached_(isUncached),
      surroundings_(surroundings),
      completion_(std::move(completion)),
      host_(hostOf(request_.url)),
      address_(request_.url) {}

HttpTransfer::~HttpTransfer() {
    for (auto& [name, value] : request_.headers) wipe(value);
}

void HttpTransfer::beginTime() {
    if (deadline_) return;
    const HttpLimits& limits = surroundings_.limits;
    const Duration timeout = std::clamp(request_.timeout.value_or(limits.timeout), Duration(0), limits.longestTimeout);
    deadline_ = SteadyClock::now() + std::chrono::ceil<SteadyClock::duration>(timeout);
}

MaybeError HttpTransfer::checkAddress() {
    std::unique_ptr<CURLU, UrlFreed> url(curl().url());
    if (curl().urlSet(url.get(), CURLUPART_URL, address_.c_str(), CURLU_NON_SUPPORT_SCHEME) != CURLUE_OK)
        return httpError(CURLE_URL_MALFORMAT, "the URL is malformed");
    const std::string scheme = urlPart(url.get(), CURLUPART_SCHEME);
    isPlain_ = scheme == "http";
    isLoopback_ = isLoopback(urlPart(url.get(), CURLUPART_HOST));
    if (!isPlain_ && scheme != "https")
        return httpError(CURLE_UNSUPPORTED_PROTOCOL, "the scheme " + scheme + " is not supported");
    if (isPlain_ && !isLoopback_)
        return httpError(CURLE_UNSUPPORTED_PROTOCOL, "plain http is for this machine only; use https");
    if (isPlain_ && isSecured_) return httpError(CURLE_UNSUPPORTED_PROTOCOL, "a redirect leaves https");
    return std::nullopt;
}

// Redirects carry none of them.
const HttpHeaders& HttpTransfer::ownHeaders() const {
    static const HttpHeaders none;
    return redirects_ > 0 ? none : request_.headers;
}

std::optional<HttpResponse> HttpTransfer::prepare() {
    beginTime();
    if (MaybeError error = checkAddress()) return httpFailure(std::move(*error));
    if (redirects_ == 0) nameSourceApplication();
    if (std::optional<HttpResponse> stored = storedAnswer()) return stored;

    if (!easy_) easy_.reset(curl().easyInit());
    if (!easy_) return httpFailure(httpError(CURLE_OUT_OF_MEMORY, "out of memory"));
    curl().easyReset(easy_.get());  // keeps the connections
    headers_.clear();
    headerSize_ = 0;
    body_.clear();
    errorText_[0] = 0;
    setOptions();
    setBody();
    if (MaybeError error = setHeaders()) return httpFailure(std::move(*error));
    return std::nullopt;
}

// Only a developer's server, on this machine, is told which application a request is for.
void HttpTransfer::nameSourceApplication() {
    const std::optional<std::string>& application = request_.sourceApplication;
    if (application && isLoopback_ && isOneLine(*application) &&
        surroundings_.profile.content()->http.namesApplications)
        request_.headers["X-Orvane-Source-Application"] = *application;
}

std::optional<HttpResponse> HttpTransfer::storedAnswer() {
    isCached_ = request_.method == "GET" && request_.body.empty() && ownHeaders().empty();
    if (!isCached_) return std::nullopt;
    codec::HttpCache& cache = surroundings_.cache;
    asked_ = cache.now();
    stored_ = isUncached_ ? nullptr : cache.find(address_);
    return stored_ ? cache.freshAnswer(*stored_) : std::nullopt;
}

void HttpTransfer::setOptions() {
    set(CURLOPT_PRIVATE, this);
    set(CURLOPT_URL, address_.c_str());
    set(CURLOPT_PROTOCOLS_STR, "http,https");
    set(CURLOPT_NOSIGNAL, 1L);
    set(CURLOPT_QUICK_EXIT, 1L);  // the time-out does not wait for a slow resolver
    set(CURLOPT_ERRORBUFFER, errorText_.data());
    set(CURLOPT_PREREQFUNCTION, &HttpTransfer::onSend);
    set(CURLOPT_PREREQDATA, this);
    set(CURLOPT_HEADERFUNCTION, &HttpTransfer::onHeader);
    set(CURLOPT_HEADERDATA, this);
    set(CURLOPT_WRITEFUNCTION, &HttpTransfer::onBody);
    set(CURLOPT_WRITEDATA, this);
    set(CURLOPT_ACCEPT_ENCODING, "");
    set(CURLOPT_SUPPRESS_CONNECT_HEADERS, 1L);
    set(CURLOPT_HTTP_VERSION, long{CURL_HTTP_VERSION_2TLS});
    // Requests sent together share a connection where the server can. Without TLS this is known only after the first
    // answer, and a server that stays silent would block the others.
    if (!isPlain_) set(CURLOPT_PIPEWAIT, 1L);
    // What cannot be sent again uses no connection that the server may just be closing.
    if (!isRepeatable()) set(CURLOPT_MAXAGE_CONN, 5L);
    // Requests to this machine bypass any proxy that the environment names.
    if (isLoopback_) set(CURLOPT_NOPROXY, "*");
    // Trusted in addition to the system's authorities, and only if root or our user alone can write the file that says
    // so.
    const std::shared_ptr<const ProfileContent> content = surroundings_.profile.content();
    if (content->http.caFile && content->http.caFileSource.isTrusted())
        set(CURLOPT_CAINFO, content->http.caFile->c_str());
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(*deadline_ - SteadyClock::now()).count();
    set(CURLOPT_TIMEOUT_MS, static_cast<long>(std::max<decltype(left)>(left, 1)));
}

void HttpTransfer::setBody() {
    if (request_.method == "GET" && request_.body.empty()) return;
    if (request_.method == "HEAD") return set(CURLOPT_NOBODY, 1L);
    set(CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(request_.body.size()));
    set(CURLOPT_POSTFIELDS, request_.body.empty() ? "" : reinterpret_cast<const char*>(request_.body.data()));
    if (request_.method != "POST") set(CURLOPT_CUSTOMREQUEST, request_.method.c_str());
}

void HttpTransfer::addHeaderLine(const std::string& name, std::string_view value) {
    std::string line;
    line.reserve(name.size() + 2 + value.size());
    line.append(name);
    if (trimmed(value).empty())
        line.append(";");
    else
        line.append(": ").append(value);
    headerList_.reset(curl().slistAppend(headerList_.release(), line.c_str()));
    wipe(line);
}

MaybeError HttpTransfer::setHeaders() {
    const HttpHeaders& own = ownHeaders();
    // Headers that the library would otherwise add to a body.
    headerList_.reset(curl().slistAppend(nullptr, "Expect:"));
    if (!own.contains("Content-Type")) headerList_.reset(curl().slistAppend(headerList_.release(), "Content-Type:"));
    if (isUncached_ && !own.contains("Cache-Control")) addHeaderLine("Cache-Control", "no-cache");
    for (const auto& [name, value] : own) {
        if (!isSafeHeader(name, value))
            return httpError(CURLE_BAD_FUNCTION_ARGUMENT, "a header of the request is malformed");
        addHeaderLine(name, value);
    }
    if (stored_)
        for (const auto& [name, value] : codec::revalidationHeaders(stored_->answer.headers))
            addHeaderLine(name, value);
    set(CURLOPT_HTTPHEADER, headerList_.get());
    return std::nullopt;
}

// Called before each sending. The library itself sends again what a connection that broke has not answered, as often as
// it takes; but the server may have done what it was asked.
int HttpTransfer::onSend(void* self, char*, char*, int, int) {
    auto& transfer = *static_cast<HttpTransfer*>(self);
    const int most = transfer.isRepeatable() ? 2 : 1;
    if (transfer.sent_ == most) {
        transfer.failure_ = httpError(CURLE_GOT_NOTHING, "the connection ended before the answer");
        return CURL_PREREQFUNC_ABORT;
    }
    ++transfer.sent_;
    return CURL_PREREQFUNC_OK;
}

std::size_t HttpTransfer::onHeader(char* bytes, std::size_t, std::size_t size, void* self) {
    auto& transfer = *static_cast<HttpTransfer*>(self);
    const std::string_view line = trimmed({bytes, size});
    // Each status line starts the headers again, for instance after an interim answer.
    if (line.starts_with("HTTP/")) transfer.headers_.clear();
    transfer.headerSize_ += size;
    if (transfer.headerSize_ > headerBytes) {
        transfer.failure_ = httpError(CURLE_FILESIZE_EXCEEDED, "the answer's headers are too large");
        return 0;
    }
    const std::size_t colon = line.find(':');
    if (colon == 0 || colon == line.npos) return size;
    const std::string_view value = trimmed(line.substr(colon + 1));
    auto [entry, isNew] = transfer.headers_.try_emplace(std::string(line.substr(0, colon)), value);
    if (!isNew) entry->second.append(", ").append(value);
    return size;
}

std::size_t HttpTransfer::onBody(char* bytes, std::size_t, std::size_t size, void* self) {
    auto& transfer = *static_cast<HttpTransfer*>(self);
    if (size > transfer.surroundings_.limits.answerBytes - transfer.body_.size()) {
        transfer.failure_ = httpError(CURLE_FILESIZE_EXCEEDED, "the answer is too large");
        return 0;
    }
    transfer.body_.insert(transfer.body_.end(), bytes, bytes + size);
    return size;
}

// The redirect to follow, or null.
const char* HttpTransfer::redirect() const {
    const char* location = nullptr;
    if (isRepeatable()) curl().easyGetinfo(easy_.get(), CURLINFO_REDIRECT_URL, &location);
    return location;
}

// Whether the body is known to be complete. Over HTTP/1 without a length it ends with the connection, which may have
// broken.
bool HttpTransfer::isWhole() const {
    long version = 0;
    curl().easyGetinfo(easy_.get(), CURLINFO_HTTP_VERSION, &version);
    return version >= CURL_HTTP_VERSION_2_0 || headers_.contains("Content-Length") ||
           headers_.contains("Transfer-Encoding");
}

// Handles, in this order, a failure, the confirmation of the stored answer, a redirect and a final answer. Only the
// latter is stored.
std::optional<HttpResponse> HttpTransfer::finish(CURLcode result) {
    long status = 0;
    curl().easyGetinfo(easy_.get(), CURLINFO_RESPONSE_CODE, &status);
    if (result != CURLE_OK) {
        const char* text = errorText_[0] ? errorText_.data() : curl().easyStrerror(result);
        HttpResponse response = httpFailure(failure_ ? *std::move(failure_) : httpError(result, text));
        response.status = static_cast<int>(status);  // of an answer that broke off
        return response;
    }
    codec::HttpCache& cache = surroundings_.cache;

    if (stored_ && status == 304) {
        if (codec::isConfirmed(stored_->answer.headers, headers_)) return cache.revalidated(*stored_, asked_, headers_);
        cache.forget(address_);
        return std::nullopt;
    }
    if (const char* location = redirect()) {
        if (redirects_++ == surroundings_.limits.redirects)
            return httpFailure(httpError(CURLE_TOO_MANY_REDIRECTS, "too many redirects"));
        address_ = location;
        sent_ = 0;
        isSecured_ = !isPlain_;
        return std::nullopt;
    }
    const bool isKept = isCached_ && status == 200 && isWhole();
    HttpResponse response = httpSuccess(static_cast<int>(status), std::move(headers_), std::move(body_));
    if (isKept) cache.store(address_, asked_, response);
    // A successful change makes what is kept of the address out of date.
    if (!isRepeatable() && status < 400) cache.forget(address_);
    return response;
}

}  // namespace vrx::host
