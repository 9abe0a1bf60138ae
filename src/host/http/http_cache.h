// The answers that the shared session keeps, in memory, the least recently used going first. An answer is given again
// only for a request with the same address and the very same headers of its own: so whatever headers it varies by, they
// match, and what one account was answered no other one gets. Belongs to one thread.
#pragma once

#include <array>
#include <list>
#include <memory>
#include <optional>
#include <string>

#include "vrx/platform/clock.h"
#include "vrx/platform/http_request.h"

namespace vrx::host {

class HttpCache {
public:
    // Of address and headers. A hash: headers may hold what should not lie about in memory.
    using Key = std::array<std::uint8_t, 32>;
    static Key keyOf(const std::string& url, const platform::HttpHeaders& requestHeaders);
    // Whether a request with these headers asks nothing of caches itself; one that does has the cache out of its way.
    static bool isFor(const platform::HttpHeaders& requestHeaders);

    struct Entry {
        Key key;
        std::string url;
        platform::HttpResponse answer;
        platform::Date arrived;
        platform::Duration ageOnArrival;
        platform::Duration lifetime;
        std::size_t size;
    };
    using Stored = std::shared_ptr<const Entry>;

    HttpCache(const platform::Clock& clock, std::size_t entries, std::size_t bytes)
        : clock_(clock), entriesAtMost_(entries), bytesAtMost_(bytes) {}

    platform::Date now() const { return clock_.now(); }
    Stored find(const Key& key);
    // The stored answer, if it may be given without asking.
    std::optional<platform::HttpResponse> freshAnswer(const Entry& stored) const;

    // Keeps a whole answer of status 200 in place of the one before, or neither when it may not be kept.
    void store(const Key& key, const std::string& url, platform::Date asked, const platform::HttpResponse& answer);
    // The stored answer, which still holds, as the confirming headers leave it; it is kept so.
    platform::HttpResponse revalidated(const Entry& stored, platform::Date asked,
                                       const platform::HttpHeaders& confirmation);
    // Lets go of what is kept for the address.
    void forget(const std::string& url);

    std::size_t entries() const { return entries_.size(); }
    std::size_t bytes() const { return bytes_; }

private:
    using Entries = std::list<Stored>;
    static std::size_t sizeOf(const std::string& url, const platform::HttpResponse& answer);
    void remove(Entries::iterator entry);
    Entries::iterator search(const Key& key);

    const platform::Clock& clock_;
    const std::size_t entriesAtMost_;
    const std::size_t bytesAtMost_;
    Entries entries_;  // so few that searching beats an index; the one used last stands first
    std::size_t bytes_ = 0;
};

}  // namespace vrx::host
