// What an answer's headers say about keeping it: pure functions, for a cache that one user has to himself. What cannot
// be read is taken as if the answer forbade it.
#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <string_view>

#include "vrx/platform/date.h"
#include "vrx/platform/http_request.h"

namespace vrx::host {

// The directives that such a cache heeds; the others are for shared caches, or allow what it never does (a stale answer
// is never given).
struct CacheControl {
    bool isStorable = true;       // no no-store
    bool mustRevalidate = false;  // no-cache, also when it is said of single headers
    std::optional<std::chrono::seconds> maxAge{};
};
CacheControl parseCacheControl(std::string_view value);

// A date in any of the forms that headers have; nothing for what is none, such as the customary "0".
std::optional<platform::Date> parseHttpDate(const std::string& text);

// Whether the answer may be kept for requests that carry the same headers, and whether that is of any use.
bool mayStore(const platform::HttpHeaders& answer, platform::Date arrived);

// For how long after it was made it may be given again without asking. None when it does not say: the agent asks
// seldom, and a guess from the time of the last change would keep a new document from it for days.
platform::Duration freshnessLifetime(const platform::HttpHeaders& answer, platform::Date arrived);

// How old it was when it had arrived: by what it says, by the clock, and by how long it was on its way.
platform::Duration ageOnArrival(const platform::HttpHeaders& answer, platform::Date asked, platform::Date arrived);

// The headers that ask whether the answer still holds; none when it names nothing to ask by.
platform::HttpHeaders revalidationHeaders(const platform::HttpHeaders& answer);

// Whether an answer of status 304 is about the stored one. Some are about another that the server has meanwhile.
bool isConfirmed(const platform::HttpHeaders& stored, const platform::HttpHeaders& confirmation);

// The headers of the stored answer, brought up to date by those of the one that says it still holds.
platform::HttpHeaders revalidatedHeaders(platform::HttpHeaders stored, const platform::HttpHeaders& confirmation);

}  // namespace vrx::host
