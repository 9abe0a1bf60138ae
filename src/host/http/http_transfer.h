// One request, over all of its redirects, on a libcurl handle of its own. Used by the transfer thread only, once that
// has it. The request's headers, which may hold credentials, are wiped at the end.
#pragma once

#include <array>
#include <chrono>
#include <memory>
#include <optional>
#include <string>

#include "vrx/codec/http_cache.h"
#include "vrx/host/base/requester.h"
#include "vrx/host/http/curl.h"
#include "vrx/host/http/http.h"
#include "vrx/host/profile/device_profile.h"

namespace vrx::host {

platform::Error httpError(int code, std::string text);
platform::HttpResponse httpFailure(platform::Error error);
platform::HttpResponse httpSuccess(int status, platform::HttpHeaders headers, platform::Data body);

// What all transfers share. Outlives them.
struct HttpSurroundings {
    const HttpLimits& limits;
    const DeviceProfile& profile;
    codec::HttpCache& cache;
};

class HttpTransfer {
public:
    using Completion = platform::OnceCallback<platform::HttpResponse>;

    HttpTransfer(platform::HttpRequest request, bool isUncached, HttpSurroundings surroundings, Completion completion);
    ~HttpTransfer();
    HttpTransfer(const HttpTransfer&) = delete;
    HttpTransfer& operator=(const HttpTransfer&) = delete;

    CURL* easy() const { return easy_.get(); }
    // For whom it is sent.
    Requester requester() const { return requester_; }
    // Of the request's own address, port included; redirects may lead elsewhere.
    const std::string& host() const { return host_; }
    Completion takeCompletion() { return std::move(completion_); }

    // Prepares the request to the next address, the request's own or a redirect's. The request's time begins with the
    // first call. Returns the response when nothing is to be sent: a stored answer that is fresh, or a failure.
    std::optional<platform::HttpResponse> prepare();
    // To be called when the library is done. Returns the response, or nothing when another address has to be asked:
    // then prepare() is next.
    std::optional<platform::HttpResponse> finish(CURLcode result);

private:
    struct Freed {
        void operator()(CURL* easy) const { curl().easyCleanup(easy); }
        void operator()(curl_slist* list) const;
    };
    using SteadyClock = std::chrono::steady_clock;

    void beginTime();
    bool isRepeatable() const { return request_.method == "GET" || request_.method == "HEAD"; }
    platform::MaybeError checkAddress();
    const platform::HttpHeaders& ownHeaders() const;
    void nameSourceApplication();
    std::optional<platform::HttpResponse> storedAnswer();
    void setOptions();
    void setBody();
    platform::MaybeError setHeaders();
    void addHeaderLine(const std::string& name, std::string_view value);
    const char* redirect() const;
    bool isWhole() const;
    template <class T>
    void set(CURLoption option, T value) {
        curl().easySetopt(easy_.get(), option, value);
    }

    static int onSend(void* self, char* address, char* localAddress, int port, int localPort);
    static std::size_t onHeader(char* bytes, std::size_t one, std::size_t size, void* self);
    static std::size_t onBody(char* bytes, std::size_t one, std::size_t size, void* self);

    platform::HttpRequest request_;
    const bool isUncached_;
    const HttpSurroundings surroundings_;
    std::optional<SteadyClock::time_point> deadline_;
    Completion completion_;
    const Requester requester_ = RequesterScope::current();
    const std::string host_;

    std::string address_;
    bool isPlain_ = false;     // not over TLS
    bool isLoopback_ = false;  // to this machine
    bool isSecured_ = false;   // what redirected there came over TLS
    int redirects_ = 0;
    int sent_ = 0;  // times, to this address

    bool isCached_ = false;            // may be answered from the cache and stored in it
    codec::HttpCache::Stored stored_;  // the answer that the request asks to confirm
    platform::Date asked_;

    std::unique_ptr<CURL, Freed> easy_;
    std::unique_ptr<curl_slist, Freed> headerList_;
    std::array<char, CURL_ERROR_SIZE> errorText_{};

    platform::HttpHeaders headers_;
    std::size_t headerSize_ = 0;
    platform::Data body_;
    platform::MaybeError failure_;  // why this side ended the transfer
};

}  // namespace vrx::host
