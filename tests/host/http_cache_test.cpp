#include "host/http_cache.h"

#include <gmock/gmock.h>

#include "host/http_cache_rules.h"
#include "support.h"

namespace vrx::host {
namespace {

using namespace std::chrono_literals;
using platform::HttpHeaders;
using platform::HttpResponse;

TEST(HttpCacheRules, ReadCacheControlAndDates) {
    struct Case {
        const char* text;
        bool isStorable, mustRevalidate;
        int maxAge;  // -1 for none
    };
    const Case cases[] = {
        {"", true, false, -1},
        {" MAX-AGE = 5 ", true, false, 5},
        {"max-age=\"5\", max-age=6", true, false, 5},
        {"s-maxage=9,public,,x=\"no-store, \\\" no-cache\" , max-age=1", true, false, 1},
        {"private=\"Set-Cookie\", no-cache=\"X-A\"", true, true, -1},
        {"max-age=1,No-Store", false, false, 1},
        {"max-age=\"1, no-store", false, false, -1},
        {"max-age=\"1\\", false, false, -1},
        {"max-age", true, false, 0},
        {"max-age=-1", true, false, 0},
        {"max-age=5s", true, false, 0},
        {"max-age=99999999999999999999", true, false, 1 << 30},
    };
    for (const Case& c : cases) {
        const CacheControl control = parseCacheControl(c.text);
        EXPECT_EQ(control.isStorable, c.isStorable) << c.text;
        EXPECT_EQ(control.mustRevalidate, c.mustRevalidate) << c.text;
        const auto maxAge = c.maxAge < 0 ? std::nullopt : std::optional(std::chrono::seconds(c.maxAge));
        if (c.maxAge == 1 << 30)
            EXPECT_GT(control.maxAge, maxAge) << c.text;
        else
            EXPECT_EQ(control.maxAge, maxAge) << c.text;
    }
    for (const char* text :
         {"Sun, 06 Nov 1994 08:49:37 GMT", "Sunday, 06-Nov-94 08:49:37 GMT", "Sun Nov  6 08:49:37 1994"})
        EXPECT_EQ(parseHttpDate(text), platform::dateFromEpoch(784'111'777)) << text;
    for (const char* text : {"", "0", "-1", "now", "Sun, 06 Nov 1994 25:49:37 GMT", "Nov 1994"})
        EXPECT_EQ(parseHttpDate(text), std::nullopt) << text;
}

TEST(HttpCache, StaysWithinItsBoundsAndLetsTheLeastRecentlyUsedGo) {
    SettableClock clock;
    HttpCache cache(clock, 3, 4000);
    auto add = [&](const std::string& url, std::size_t size, const HttpHeaders& headers = {}) {
        HttpResponse answer{.status = 200, .headers = {{"Cache-Control", "max-age=9"}}};
        answer.body = platform::Data(size);
        cache.store(HttpCache::keyOf(url, headers), url, clock.now(), answer);
        EXPECT_LE(cache.bytes(), 4000u);
        EXPECT_GE(cache.bytes(), cache.entries() * 100);
    };
    auto has = [&](const std::string& url, const HttpHeaders& headers = {}) {
        return cache.find(HttpCache::keyOf(url, headers)) != nullptr;
    };
    add("a", 1);
    add("b", 1, {{"X", "1"}});
    add("c", 1);
    EXPECT_TRUE(has("a"));
    EXPECT_FALSE(has("b", {{"X", "2"}}));
    add("d", 1);
    EXPECT_FALSE(has("b", {{"X", "1"}}));
    EXPECT_TRUE(has("a"));
    add("e", 3000);  // only one fits beside it
    EXPECT_TRUE(has("a") && has("e"));
    add("e", 5000);  // and this one replaces what it cannot be itself
    EXPECT_FALSE(has("e"));
    cache.forget("a");
    EXPECT_EQ(cache.entries() + cache.bytes(), 0u);
}

}  // namespace
}  // namespace vrx::host
