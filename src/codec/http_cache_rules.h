// What an answer's headers say about keeping it, for a cache with a single user. Pure functions. A header that cannot
// be read counts as forbidding it.
#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <string_view>

#include "vrx/platform/date.h"
#include "vrx/platform/http_request.h"

namespace vrx::codec {

// The directives that a private cache obeys. The others are for shared caches, or allow stale answers, which are never
// given.
struct CacheControl {
    bool isStorable = true;       // no no-store
    bool mustRevalidate = false;  // no-cache, also when it is said of single headers
    std::optional<std::chrono::seconds> maxAge{};
};
CacheControl parseCacheControl(std::string_view value);

// Whether the answer may be kept for requests with the same headers, and could be used later.
bool mayStore(const platform::HttpHeaders& answer, platform::Date arrived);

// How long after it was made the answer may be given without asking. Zero when it does not say: a guess from the time
// of the last change could keep a new document from the agent for days.
platform::Duration freshnessLifetime(const platform::HttpHeaders& answer, platform::Date arrived);

// The answer's age on arrival: the larger of what its Age says plus its time on the way, and what its Date says.
platform::Duration ageOnArrival(const platform::HttpHeaders& answer, platform::Date asked, platform::Date arrived);

// The headers that ask whether the answer still holds. Empty when it has neither tag nor date of change.
platform::HttpHeaders revalidationHeaders(const platform::HttpHeaders& answer);

// Whether an answer of status 304 confirms the stored one. Some are about a newer one that the server has meanwhile.
bool isConfirmed(const platform::HttpHeaders& stored, const platform::HttpHeaders& confirmation);

// The stored answer's headers, updated by those of the confirming one.
platform::HttpHeaders revalidatedHeaders(platform::HttpHeaders stored, const platform::HttpHeaders& confirmation);

}  // namespace vrx::codec
