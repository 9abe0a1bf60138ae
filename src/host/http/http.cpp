#include "vrx/host/http/http.h"

#include <sys/eventfd.h>

#include <algorithm>
#include <climits>
#include <csignal>
#include <map>
#include <mutex>
#include <system_error>
#include <thread>
#include <vector>

#include "vrx/codec/http_cache.h"
#include "vrx/host/base/descriptor.h"
#include "vrx/host/base/files.h"
#include "vrx/host/http/curl.h"
#include "vrx/host/http/http_transfer.h"
#include "vrx/host/http/transfer_line.h"
#include "vrx/platform/url.h"

namespace vrx::host {

using platform::HttpRequest;
using platform::HttpResponse;
using platform::Url;

using Completion = HttpTransfer::Completion;

// The transfer thread and its transfers.
class HttpTransfers {
public:
    HttpTransfers(platform::Queue& answers, const platform::Clock& clock, const DeviceProfile& profile,
                  const HttpLimits& limits)
        : answers_(answers), limits_(limits), profile_(profile), cache_(clock, limits.storedBytes), line_(limits_) {}
    ~HttpTransfers() { stop(); }

    void send(HttpRequest request, bool isUncached, Completion completion);
    void stop();

private:
    void sendFile(const Url& url, Completion completion);
    bool start();
    void wake();
    void run();
    void beginWaiting();
    void begin(std::unique_ptr<HttpTransfer> transfer);
    void finishEnded();
    int untilFirstOverdue() const;
    void answer(HttpTransfer& transfer, HttpResponse response);

    platform::Queue& answers_;
    const HttpLimits limits_;
    const DeviceProfile& profile_;

    std::mutex mutex_;
    std::vector<std::unique_ptr<HttpTransfer>> sent_;  // waiting for the transfer thread
    bool isStopping_ = false;
    std::thread thread_;
    CURLM* multi_ = nullptr;
    Descriptor wakeFile_;  // the library's own way to wake it can be missing without a word

    // Used by the transfer thread only.
    codec::HttpCache cache_;
    TransferLine line_;
    std::map<HttpTransfer*, std::unique_ptr<HttpTransfer>> running_;
};

// A transfer is handed over under the lock, so that stop() misses none.
void HttpTransfers::send(HttpRequest request, bool isUncached, Completion completion) {
    if (std::optional<Url> url = Url::parse(request.url); url && url->isFile())
        return sendFile(*url, std::move(completion));
    auto transfer = std::make_unique<HttpTransfer>(std::move(request), isUncached,
                                                   HttpSurroundings{limits_, profile_, cache_}, std::move(completion));
    std::unique_lock lock(mutex_);
    if (isStopping_) {
        lock.unlock();
        transfer->takeCompletion().letGo();
        return;
    }
    if (!start()) {
        lock.unlock();
        const std::string& why = curl().problem;
        return answer(*transfer, httpFailure(httpError(CURLE_FAILED_INIT, why.empty() ? "cannot begin" : why)));
    }
    sent_.push_back(std::move(transfer));
    wake();
}

// Reads the file here: the library could wait for ever on one that is not regular.
void HttpTransfers::sendFile(const Url& url, Completion completion) {
    answers_.post([path = url.filePath(), limit = limits_.answerBytes, completion = std::move(completion)]() mutable {
        if (!path) return completion(httpFailure(httpError(CURLE_URL_MALFORMAT, "the URL names no local file")));
        platform::Result<FileContent> content = readFile(*path);
        if (!content) return completion(httpFailure(content.error()));
        if (content->bytes.size() > limit)
            return completion(httpFailure(httpError(CURLE_FILESIZE_EXCEEDED, "the file is too large")));
        completion(httpSuccess(0, {}, std::move(content).value().bytes));
    });
}

bool HttpTransfers::start() {
    if (multi_) return true;
    if (!curl().problem.empty() || !(multi_ = curl().multiInit())) return false;
    curl().multiSetopt(multi_, CURLMOPT_MAXCONNECTS, 8L);
    try {
        wakeFile_ = makeEventFile();
        thread_ = std::thread([this] { run(); });
    } catch (const std::system_error&) {
        curl().multiCleanup(std::exchange(multi_, nullptr));
        return false;
    }
    return true;
}

void HttpTransfers::wake() {
    eventfd_write(wakeFile_.number(), 1);
}

void HttpTransfers::stop() {
    platform::ShutdownScope shutdown;
    {
        std::lock_guard lock(mutex_);
        if (std::exchange(isStopping_, true)) return;
        if (!multi_) return;
        wake();
    }
    thread_.join();
    sent_.clear();
    line_.clear();
    for (auto& [transfer, owned] : running_) curl().multiRemoveHandle(multi_, transfer->easy());
    running_.clear();
    curl().multiCleanup(multi_);
}

void HttpTransfers::run() {
    // Writing to a connection that the server closed is then only an error.
    sigset_t brokenPipe;
    sigemptyset(&brokenPipe);
    sigaddset(&brokenPipe, SIGPIPE);
    pthread_sigmask(SIG_BLOCK, &brokenPipe, nullptr);

    while (true) {
        std::vector<std::unique_ptr<HttpTransfer>> sent;
        {
            std::lock_guard lock(mutex_);
            if (isStopping_) return;
            sent.swap(sent_);
        }
        for (auto& transfer : sent) line_.add(std::move(transfer));
        beginWaiting();
        int running = 0;
        curl().multiPerform(multi_, &running);
        finishEnded();
        beginWaiting();
        // Wakes only for bytes, for the library's own timers, for a new request and for one that waits for too long.
        curl_waitfd woken{wakeFile_.number(), CURL_WAIT_POLLIN, 0};
        if (curl().multiPoll(multi_, &woken, 1, untilFirstOverdue(), nullptr) != CURLM_OK) pauseAfterFailedPoll();
        eventfd_t count;
        eventfd_read(wakeFile_.number(), &count);
    }
}

// The library can wait as well, but counts connections, and its waiting as the request's time.
void HttpTransfers::beginWaiting() {
    while (auto transfer = line_.next()) begin(std::move(transfer));
    for (auto& transfer : line_.removeOverdue(TransferLine::SteadyClock::now()))
        answer(*transfer, httpFailure(httpError(CURLE_OPERATION_TIMEDOUT, "too many requests are under way")));
}

int HttpTransfers::untilFirstOverdue() const {
    const auto first = line_.firstOverdue();
    if (!first) return INT_MAX;
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(*first - TransferLine::SteadyClock::now()).count();
    return static_cast<int>(std::clamp<decltype(left)>(left, 0, INT_MAX));
}

void HttpTransfers::begin(std::unique_ptr<HttpTransfer> transfer) {
    if (std::optional<HttpResponse> response = transfer->prepare()) {
        line_.ended(*transfer);
        return answer(*transfer, std::move(*response));
    }
    curl().multiAddHandle(multi_, transfer->easy());
    HttpTransfer* key = transfer.get();
    running_.emplace(key, std::move(transfer));
}

void HttpTransfers::finishEnded() {
    int left = 0;
    while (CURLMsg* message = curl().multiInfoRead(multi_, &left)) {
        if (message->msg != CURLMSG_DONE) continue;
        const CURLcode result = message->data.result;
        HttpTransfer* ended = nullptr;
        curl().easyGetinfo(message->easy_handle, CURLINFO_PRIVATE, &ended);
        curl().multiRemoveHandle(multi_, ended->easy());
        std::unique_ptr<HttpTransfer> transfer = std::move(running_.extract(ended).mapped());

        if (std::optional<HttpResponse> response = transfer->finish(result)) {
            line_.ended(*transfer);
            answer(*transfer, std::move(*response));
        } else {
            begin(std::move(transfer));
        }
    }
}

void HttpTransfers::answer(HttpTransfer& transfer, HttpResponse response) {
    const RequesterScope scope(transfer.requester());
    answers_.post([completion = transfer.takeCompletion(), response = std::move(response)]() mutable {
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

HttpSessions::HttpSessions(platform::Queue& answers, const platform::Clock& clock, const DeviceProfile& profile,
                           const HttpLimits& limits)
    : transfers_(std::make_shared<HttpTransfers>(answers, clock, profile, limits)),
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
