// What the server has seen: the requests, in the order in which they began, and counters. Any thread may use it.
#pragma once

#include <httplib.h>

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <map>
#include <mutex>
#include <string>

#include "coverage_server/json.h"

namespace vrx::coverage_server {

struct SeenRequest {
    std::uint64_t id = 0;
    std::chrono::system_clock::time_point time;
    std::uint64_t connection = 0;
    std::uint64_t requestOfConnection = 0;  // 1 for its first
    std::string endpoint;                   // empty for a path that is none
    std::string method;
    std::string path;
    httplib::Headers headers;  // the token's value replaced by its origin
    std::string body;          // its beginning, when it is very long
    std::size_t bodyBytes = 0;
    bool isAnswered = false;
    int status = 0;  // 0 while there is none, or when none was sent
    std::string fault;
    std::string reason;

    Json json() const;
    std::size_t bytes() const;  // that keeping it takes, about
};

class RequestLog {
public:
    // Notes the request as begun and gives it its id.
    std::uint64_t begin(SeenRequest request);
    // Notes what became of it, and returns it; one that is no longer kept has the id 0.
    SeenRequest finish(std::uint64_t id, int status, const std::string& fault, const std::string& reason);
    // One that was too malformed to be served.
    void countMalformed(int status);
    void countConnection();
    void countEnded(std::uint64_t bytesSent);
    void countHandshakeFailure();
    void countRefused();

    struct Seen {
        Json requests;
        bool isEnough;
    };
    // The requests kept; waits, for at most that long, until enough of them have been answered, or have begun.
    Seen requests(std::size_t atLeast, bool answered, std::chrono::milliseconds longest) const;
    void clearRequests();
    Json counters() const;
    void clearCounters();
    // Wakes whoever waits.
    void end();

private:
    mutable std::mutex mutex_;
    mutable std::condition_variable changed_;
    bool isEnding_ = false;
    std::uint64_t lastId_ = 0;
    std::deque<SeenRequest> kept_;
    std::size_t keptBytes_ = 0;

    struct Counters {
        std::uint64_t connections = 0, ended = 0, refused = 0, handshakeFailures = 0;
        std::uint64_t requests = 0, onReusedConnections = 0, malformed = 0, withFaults = 0, bytesSent = 0;
        std::map<std::string, std::uint64_t> byEndpoint;
        std::map<int, std::uint64_t> byStatus;
    };
    Counters counters_;
};

}  // namespace vrx::coverage_server
