#include "vrx/codec/http_cache.h"

#include "vrx/codec/http_cache_rules.h"

namespace vrx::codec {

using platform::Date;
using platform::Duration;
using platform::HttpHeaders;
using platform::HttpResponse;

namespace {

std::size_t sizeOf(const std::string& url, const HttpResponse& answer) {
    constexpr std::size_t headerOverhead = 100;  // of its place in the map
    std::size_t size = sizeof(HttpCache::Entry) + 2 * url.size() + (answer.body ? answer.body->size() : 0);
    for (const auto& [name, value] : answer.headers) size += headerOverhead + name.size() + value.size();
    return size;
}

}  // namespace

HttpCache::Stored HttpCache::find(const std::string& url) const {
    const auto entry = entries_.find(url);
    return entry == entries_.end() ? nullptr : entry->second;
}

std::optional<HttpResponse> HttpCache::freshAnswer(const Entry& stored) const {
    const Duration resident = now() - stored.arrived;
    const Duration age = stored.ageOnArrival + resident;
    // Once the clock has been set back, the age is unknown.
    if (resident < Duration(0) || age >= stored.lifetime) return std::nullopt;
    HttpResponse answer = stored.answer;
    answer.headers["Age"] = std::to_string(static_cast<std::int64_t>(age.count()));
    return answer;
}

void HttpCache::store(const std::string& url, Date asked, const HttpResponse& answer) {
    forget(url);
    const Date arrived = now();
    const std::size_t size = sizeOf(url, answer);
    if (size > mostBytes_ || !mayStore(answer.headers, arrived)) return;
    if (bytes_ + size > mostBytes_) clear();
    const Duration age = ageOnArrival(answer.headers, asked, arrived);
    const Duration lifetime = freshnessLifetime(answer.headers, arrived);
    entries_.emplace(url, std::make_shared<const Entry>(Entry{url, answer, arrived, age, lifetime, size}));
    bytes_ += size;
}

HttpResponse HttpCache::revalidated(const Entry& stored, Date asked, const HttpHeaders& confirmation) {
    HttpResponse answer = stored.answer;
    answer.headers = revalidatedHeaders(std::move(answer.headers), confirmation);
    store(stored.url, asked, answer);
    return answer;
}

void HttpCache::forget(const std::string& url) {
    const auto entry = entries_.find(url);
    if (entry == entries_.end()) return;
    bytes_ -= entry->second->size;
    entries_.erase(entry);
}

void HttpCache::clear() {
    entries_.clear();
    bytes_ = 0;
}

}  // namespace vrx::codec
