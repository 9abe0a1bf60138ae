// The answers that the shared session keeps in memory, by address. Answers to requests with headers of their own, which
// may name an account, are never kept. The agent sends one request whose answer is kept, for the server's versions; so
// a small bound is enough, and all answers are dropped when a new one does not fit. Used by one thread.
#pragma once

#include <map>
#include <memory>
#include <optional>
#include <string>

#include "vrx/platform/clock.h"
#include "vrx/platform/http_request.h"

namespace vrx::codec {

class HttpCache {
public:
    struct Entry {
        std::string url;
        platform::HttpResponse answer;
        platform::Date arrived;
        platform::Duration ageOnArrival;
        platform::Duration lifetime;
        std::size_t size;
    };
    using Stored = std::shared_ptr<const Entry>;

    HttpCache(const platform::Clock& clock, std::size_t mostBytes) : clock_(clock), mostBytes_(mostBytes) {}

    platform::Date now() const { return clock_.now(); }
    // Null when nothing is kept for the address.
    Stored find(const std::string& url) const;
    // The stored answer with its age, if it may still be given without asking the server.
    std::optional<platform::HttpResponse> freshAnswer(const Entry& stored) const;

    // Keeps a whole answer of status 200 in place of the one before. When it must not be kept, neither is.
    void store(const std::string& url, platform::Date asked, const platform::HttpResponse& answer);
    // Takes over the headers by which the server confirmed the stored answer, keeps it so, and returns it.
    platform::HttpResponse revalidated(const Entry& stored, platform::Date asked,
                                       const platform::HttpHeaders& confirmation);
    void forget(const std::string& url);
    void clear();

    // The size of all kept answers, headers included.
    std::size_t bytes() const { return bytes_; }

private:
    const platform::Clock& clock_;
    const std::size_t mostBytes_;
    std::map<std::string, Stored> entries_;  // by address
    std::size_t bytes_ = 0;
};

}  // namespace vrx::codec
