#include "vrx/codec/http_cache.h"

#include <gtest/gtest.h>

#include <map>
#include <tuple>

#include "vrx/codec/http_cache_rules.h"
#include "vrx/codec/http_date.h"

namespace vrx::codec {
namespace {

using namespace std::chrono_literals;

struct StillClock final : platform::Clock {
    platform::Date now() const override { return platform::dateFromEpoch(784'111'777); }
    std::chrono::seconds timeZoneOffset() const override { return {}; }
};

TEST(HttpCacheRules, ReadCacheControlAndDates) {
    // Storable, to be revalidated, max-age.
    const std::map<std::string, std::tuple<bool, bool, std::optional<std::chrono::seconds>>> cases{
        {"", {true, false, {}}},
        {" MAX-AGE = 5 ", {true, false, 5s}},
        {"max-age=\"5\", max-age=6", {true, false, 5s}},
        {"s-maxage=9,public,,x=\"no-store, \\\" no-cache\" , max-age=1", {true, false, 1s}},
        {"private=\"Set-Cookie\", no-cache=\"X-A\"", {true, true, {}}},
        {"max-age=1,No-Store", {false, false, 1s}},
        {"max-age=\"1, no-store", {false, false, {}}},
        {"max-age=\"1\\", {false, false, {}}},
        {"max-age", {true, false, 0s}},
        {"max-age=-1", {true, false, 0s}},
        {"max-age=99999999999999999999", {true, false, std::chrono::seconds(std::int64_t{1} << 31)}},
    };
    for (const auto& [text, expected] : cases) {
        const CacheControl read = parseCacheControl(text);
        EXPECT_EQ(std::tuple(read.isStorable, read.mustRevalidate, read.maxAge), expected) << text;
    }
    for (const char* text :
         {"Sun, 06 Nov 1994 08:49:37 GMT", "Sunday, 06-Nov-94 08:49:37 GMT", "Sun Nov  6 08:49:37 1994"})
        EXPECT_EQ(parseHttpDate(text), platform::dateFromEpoch(784'111'777)) << text;
    for (const char* text :
         {"", "0", "-1", "now", "Sun, 06 Nov 1994 25:49:37 GMT", "Nov 1994", "Sun, 31 Feb 1994 08:49:37 GMT",
          "Sun, 06 Nov 1994 08:49:37 CET", "Sun, 06 anF 1994 08:49:37 GMT", "Sun, -6 Nov 19x4 8:49:37 GMT"})
        EXPECT_EQ(parseHttpDate(text), std::nullopt) << text;
}

TEST(HttpCache, StaysWithinItsBound) {
    const StillClock clock;
    HttpCache cache(clock, 4000);
    auto add = [&](const std::string& url, std::size_t size) {
        platform::HttpResponse answer{.status = 200, .headers = {{"Cache-Control", "max-age=9"}}};
        answer.body = platform::Data(size);
        cache.store(url, clock.now(), answer);
        EXPECT_LE(cache.bytes(), 4000u);
    };
    for (const char* url : {"a", "b", "a"}) add(url, 1000);
    EXPECT_TRUE(cache.find("a") && cache.find("b") && !cache.find("c"));
    add("c", 2000);  // there is no room for it beside them
    EXPECT_TRUE(!cache.find("a") && !cache.find("b") && cache.find("c"));
    add("c", 5000);  // and this one replaces what it cannot be itself
    EXPECT_EQ(cache.bytes(), 0u);
}

}  // namespace
}  // namespace vrx::codec
