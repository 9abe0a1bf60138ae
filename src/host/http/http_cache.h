// The answers that the shared session keeps, in memory and by address: those to GET requests without headers of their
// own. What is asked with headers, which may name an account, is never kept. The agent has one such request, for the
// server's versions; room for a few answers is enough, and when it is used up all of them go. Belongs to one thread.
#pragma once

#include <map>
#include <memory>
#include <optional>
#include <string>

#include "vrx/platform/clock.h"
#include "vrx/platform/http_request.h"

namespace vrx::host {

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

    // What is kept, with its headers.
    std::size_t bytes() const { return bytes_; }

private:
    const platform::Clock& clock_;
    const std::size_t mostBytes_;
    std::map<std::string, Stored> entries_;  // by address
    std::size_t bytes_ = 0;
};

}  // namespace vrx::host
