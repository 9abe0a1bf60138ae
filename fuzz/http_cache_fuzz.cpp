// The input is an answer's headers, a line each. Whatever they are, the cache stays within its bounds, keeps nothing
// that no-store forbids, and asks about what it keeps by headers that can be sent.
#include <algorithm>
#include <cmath>

#include "require.h"
#include "vrx/codec/http_cache.h"
#include "vrx/codec/http_cache_rules.h"
#include "vrx/codec/line_text.h"

using namespace vrx;

namespace {

struct StillClock final : platform::Clock {
    platform::Date now() const override { return platform::dateFromEpoch(784'111'777); }
    std::chrono::seconds timeZoneOffset() const override { return {}; }
} still;

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    platform::HttpResponse answer{.status = 200};
    for (std::string_view rest(reinterpret_cast<const char*>(bytes), size); !rest.empty();) {
        const std::string_view line = rest.substr(0, rest.find('\n'));
        rest.remove_prefix(std::min(line.size() + 1, rest.size()));
        const std::size_t colon = std::min(line.find(':'), line.size());
        answer.headers.emplace(line.substr(0, colon), codec::trimmed(line.substr(std::min(colon + 1, line.size()))));
    }
    static codec::HttpCache cache(still, 4096);
    const std::string url = "https://host/" + std::to_string(size);
    cache.store(url, still.now(), answer);
    require(cache.bytes() <= 4096);
    const auto stored = cache.find(url);
    const platform::Duration age = codec::ageOnArrival(answer.headers, still.now(), still.now());
    const platform::Duration lifetime = codec::freshnessLifetime(answer.headers, still.now());
    require(age.count() >= 0 && lifetime.count() >= 0 && std::isfinite(age.count() + lifetime.count()));
    if (!stored) return 0;
    require(codec::parseCacheControl(answer.headers["Cache-Control"]).isStorable);
    require(cache.freshAnswer(*stored).has_value() == (age < lifetime));
    for (const auto& [name, value] : codec::revalidationHeaders(stored->answer.headers))
        require(codec::isOneLine(value));
    require(cache.revalidated(*stored, still.now(), answer.headers).status == 200);
    return 0;
}
