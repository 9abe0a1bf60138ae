#include "vrx/host/http/http_cache.h"

#include <algorithm>
#include <array>
#include <string_view>

#include "vrx/codec/digest.h"
#include "vrx/host/http/http_cache_rules.h"

namespace vrx::host {

using platform::Date;
using platform::Duration;
using platform::HttpHeaders;
using platform::HttpResponse;

HttpCache::Key HttpCache::keyOf(const std::string& url, const HttpHeaders& requestHeaders) {
    Key key = codec::sha256(url);
    auto add = [&key](std::string_view text) {
        const Key part = codec::sha256(text);
        std::array<char, 2 * sizeof(Key)> both;
        std::ranges::copy(part, std::ranges::copy(key, both.begin()).out);
        key = codec::sha256({both.data(), both.size()});
    };
    for (const auto& [name, value] : requestHeaders) {
        add(name);
        add(value);
    }
    return key;
}

bool HttpCache::isFor(const HttpHeaders& requestHeaders) {
    constexpr std::string_view own[] = {
        "Cache-Control",       "Pragma",  "Range", "If-Match", "If-None-Match", "If-Modified-Since",
        "If-Unmodified-Since", "If-Range"};
    return std::ranges::none_of(own, [&](std::string_view name) { return requestHeaders.contains(name); });
}

// With what a header takes beside its text.
std::size_t HttpCache::sizeOf(const std::string& url, const HttpResponse& answer) {
    std::size_t size = sizeof(Entry) + url.size() + (answer.body ? answer.body->size() : 0);
    for (const auto& [name, value] : answer.headers) size += 100 + name.size() + value.size();
    return size;
}

HttpCache::Entries::iterator HttpCache::search(const Key& key) {
    return std::ranges::find_if(entries_, [&](const Stored& entry) { return entry->key == key; });
}

void HttpCache::remove(Entries::iterator entry) {
    if (entry == entries_.end()) return;
    bytes_ -= (*entry)->size;
    entries_.erase(entry);
}

HttpCache::Stored HttpCache::find(const Key& key) {
    const Entries::iterator entry = search(key);
    if (entry == entries_.end()) return nullptr;
    entries_.splice(entries_.begin(), entries_, entry);
    return entries_.front();
}

std::optional<HttpResponse> HttpCache::freshAnswer(const Entry& stored) const {
    const Duration resident = now() - stored.arrived;
    const Duration age = stored.ageOnArrival + resident;
    // Once the clock has been set back nobody knows.
    if (resident < Duration(0) || age >= stored.lifetime) return std::nullopt;
    HttpResponse answer = stored.answer;
    answer.headers["Age"] = std::to_string(static_cast<std::int64_t>(age.count()));
    return answer;
}

void HttpCache::store(const Key& key, const std::string& url, Date asked, const HttpResponse& answer) {
    remove(search(key));
    const Date arrived = now();
    const std::size_t size = sizeOf(url, answer);
    if (size > bytesAtMost_ || !mayStore(answer.headers, arrived)) return;
    const Duration age = ageOnArrival(answer.headers, asked, arrived);
    const Duration lifetime = freshnessLifetime(answer.headers, arrived);
    entries_.push_front(std::make_shared<const Entry>(Entry{key, url, answer, arrived, age, lifetime, size}));
    bytes_ += size;
    while (entries_.size() > entriesAtMost_ || bytes_ > bytesAtMost_) remove(std::prev(entries_.end()));
}

HttpResponse HttpCache::revalidated(const Entry& stored, Date asked, const HttpHeaders& confirmation) {
    HttpResponse answer = stored.answer;
    answer.headers = revalidatedHeaders(std::move(answer.headers), confirmation);
    store(stored.key, stored.url, asked, answer);
    return answer;
}

void HttpCache::forget(const std::string& url) {
    for (Entries::iterator entry = entries_.begin(); entry != entries_.end();)
        if (const Entries::iterator found = entry++; (*found)->url == url) remove(found);
}

}  // namespace vrx::host
