#include "host/http_cache.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <string_view>

#include "codec/digest.h"
#include "host/http_cache_rules.h"

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

std::size_t HttpCache::Entry::size() const {
    std::size_t size = sizeof(Entry) + url.size() + (answer.body ? answer.body->size() : 0);
    for (const auto& [name, value] : answer.headers) size += 100 + name.size() + value.size();
    return size;
}

HttpCache::Entries::iterator HttpCache::search(const Key& key) {
    return std::ranges::find_if(entries_, [&](const Stored& entry) { return entry->key == key; });
}

void HttpCache::remove(Entries::iterator entry) {
    if (entry == entries_.end()) return;
    bytes_ -= (*entry)->size();
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
    answer.headers["Age"] = std::to_string(std::llround(std::floor(age.count())));
    return answer;
}

void HttpCache::store(const Key& key, const std::string& url, Date asked, const HttpResponse& answer) {
    remove(search(key));
    const Date arrived = now();
    if (!mayStore(answer.headers, arrived)) return;
    auto entry =
        std::make_shared<const Entry>(Entry{key, url, answer, arrived, ageOnArrival(answer.headers, asked, arrived),
                                            freshnessLifetime(answer.headers, arrived)});
    if (entry->size() > bytesAtMost_) return;
    bytes_ += entry->size();
    entries_.push_front(std::move(entry));
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
