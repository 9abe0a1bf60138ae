#include "coverage_server/request_log.h"

#include <algorithm>
#include <array>
#include <ctime>

namespace vrx::coverage_server {

namespace {

constexpr std::size_t requestsKept = 4096;
constexpr std::size_t bytesKept = 32 * 1024 * 1024;
constexpr std::size_t bodyBytesKept = 16 * 1024;

std::string isoTime(std::chrono::system_clock::time_point time) {
    const auto milliseconds =
        std::chrono::duration_cast<std::chrono::milliseconds>(time.time_since_epoch()).count() % 1000;
    const std::time_t seconds = std::chrono::system_clock::to_time_t(time);
    std::tm parts{};
    std::array<char, 32> text{};
    gmtime_r(&seconds, &parts);
    std::strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%S", &parts);
    return text.data() + ("." + std::to_string(1000 + milliseconds).substr(1)) + "Z";
}

// The library adds these to a request's headers.
bool isOfLibrary(const std::string& name) {
    return name == "REMOTE_ADDR" || name == "REMOTE_PORT" || name == "LOCAL_ADDR" || name == "LOCAL_PORT";
}

}  // namespace

Json SeenRequest::json() const {
    Json list = Json::object();
    for (const auto& [name, value] : headers) {
        if (isOfLibrary(name)) continue;
        if (list.contains(name))
            list[name] = list[name].get<std::string>() + ", " + value;
        else
            list[name] = value;
    }
    return {{"id", id},
            {"time", isoTime(time)},
            {"connection", connection},
            {"requestOfConnection", requestOfConnection},
            {"endpoint", endpoint.empty() ? Json(nullptr) : Json(endpoint)},
            {"method", method},
            {"path", path},
            {"headers", list},
            {"body", body},
            {"bodyBytes", bodyBytes},
            {"answered", isAnswered},
            {"status", status},
            {"fault", fault.empty() ? Json(nullptr) : Json(fault)},
            {"reason", reason.empty() ? Json(nullptr) : Json(reason)}};
}

std::size_t SeenRequest::bytes() const {
    constexpr std::size_t each = 100;
    std::size_t bytes = body.size() + path.size() + each;
    for (const auto& [name, value] : headers) bytes += name.size() + value.size() + each;
    return bytes;
}

std::uint64_t RequestLog::begin(SeenRequest request) {
    if (request.body.size() > bodyBytesKept) request.body.resize(bodyBytesKept);
    std::lock_guard lock(mutex_);
    request.id = ++lastId_;
    ++counters_.requests;
    if (request.requestOfConnection > 1) ++counters_.onReusedConnections;
    ++counters_.byEndpoint[request.endpoint.empty() ? "other" : request.endpoint];
    keptBytes_ += request.bytes();
    kept_.push_back(std::move(request));
    while (kept_.size() > requestsKept || keptBytes_ > bytesKept) {
        keptBytes_ -= kept_.front().bytes();
        kept_.pop_front();
    }
    changed_.notify_all();
    return lastId_;
}

SeenRequest RequestLog::finish(std::uint64_t id, int status, const std::string& fault, const std::string& reason) {
    std::lock_guard lock(mutex_);
    ++counters_.byStatus[status];
    if (!fault.empty()) ++counters_.withFaults;
    const auto found = std::ranges::find(kept_, id, &SeenRequest::id);
    if (found == kept_.end()) return {};
    found->isAnswered = true;
    found->status = status;
    found->fault = fault;
    found->reason = reason;
    changed_.notify_all();
    return *found;
}

void RequestLog::countMalformed(int status) {
    std::lock_guard lock(mutex_);
    ++counters_.malformed;
    ++counters_.byStatus[status];
}

void RequestLog::countConnection() {
    std::lock_guard lock(mutex_);
    ++counters_.connections;
}

void RequestLog::countEnded(std::uint64_t bytesSent) {
    std::lock_guard lock(mutex_);
    ++counters_.ended;
    counters_.bytesSent += bytesSent;
}

void RequestLog::countHandshakeFailure() {
    std::lock_guard lock(mutex_);
    ++counters_.handshakeFailures;
}

void RequestLog::countRefused() {
    std::lock_guard lock(mutex_);
    ++counters_.refused;
}

RequestLog::Seen RequestLog::requests(std::size_t atLeast, bool answered, std::chrono::milliseconds longest) const {
    std::unique_lock lock(mutex_);
    auto isEnough = [&] {
        const auto count = answered ? std::ranges::count(kept_, true, &SeenRequest::isAnswered) : std::ssize(kept_);
        return static_cast<std::size_t>(count) >= atLeast;
    };
    changed_.wait_for(lock, longest, [&] { return isEnding_ || isEnough(); });
    Seen seen{Json::array(), isEnough()};
    for (const SeenRequest& request : kept_) seen.requests.push_back(request.json());
    return seen;
}

void RequestLog::clearRequests() {
    std::lock_guard lock(mutex_);
    kept_.clear();
    keptBytes_ = 0;
}

Json RequestLog::counters() const {
    std::lock_guard lock(mutex_);
    Json byStatus = Json::object();
    for (const auto& [status, count] : counters_.byStatus) byStatus[std::to_string(status)] = count;
    return {{"connections", counters_.connections},
            {"connectionsEnded", counters_.ended},
            {"connectionsRefused", counters_.refused},
            {"handshakeFailures", counters_.handshakeFailures},
            {"requests", counters_.requests},
            {"requestsOnReusedConnections", counters_.onReusedConnections},
            {"malformedRequests", counters_.malformed},
            {"requestsWithFaults", counters_.withFaults},
            {"bytesSentOnEndedConnections", counters_.bytesSent},
            {"requestsByEndpoint", counters_.byEndpoint},
            {"answersByStatus", byStatus}};
}

void RequestLog::clearCounters() {
    std::lock_guard lock(mutex_);
    counters_ = {};
}

void RequestLog::end() {
    std::lock_guard lock(mutex_);
    isEnding_ = true;
    changed_.notify_all();
}

}  // namespace vrx::coverage_server
