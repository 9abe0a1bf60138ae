// What the server has seen: the requests, in the order in which they arrived, and counters. Any thread may use it.
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
    std::uint64_t requestOfConnection = 0;  // 1 for the first
    std::string endpoint;                   // empty for any other path
    std::string method;
    std::string path;
    httplib::Headers headers;  // with the token's origin in place of the token
    std::string body;          // cut when it is very long
    std::size_t bodyBytes = 0;
    bool isAnswered = false;
    int status = 0;  // 0 until there is an answer, and when none was sent
    std::string fault;
    std::string reason;

    Json json() const;
    std::size_t bytes() const;  // of memory, about
};

class RequestLog {
public:
    // Notes a request that has arrived, and returns its id.
    std::uint64_t begin(SeenRequest request);
    // Notes how the request was answered, and returns it; when it is no longer kept, a request with the id 0.
    SeenRequest finish(std::uint64_t id, int status, const std::string& fault, const std::string& reason);
    // Of a request that was too malformed to be served.
    void countMalformed(int status);
    void countConnection();
    void countEnded(std::uint64_t bytesSent);
    void countHandshakeFailure();
    void countRefused();

    struct Seen {
        Json requests;
        bool isEnough;
    };
    // The requests that are kept, once at least so many have been answered (or else have arrived); waits for at most
    // the given time.
    Seen requests(std::size_t atLeast, bool answered, std::chrono::milliseconds longest) const;
    void clearRequests();
    Json counters() const;
    void clearCounters();
    // Ends all waiting, now and later.
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
