// One accepted TCP connection, plain or TLS, as the byte stream that the HTTP library reads requests from and writes
// answers to. A fault takes the answer over: it sends its own bytes, and what the library writes is swallowed.
//
// Belongs to the thread that serves it; only shutDown() may be called from another one. Bounds what a client can make
// it hold: the bytes of a request, the time a request may take to arrive, the time an answer may wait to be taken.
#pragma once

#include <httplib.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

namespace vrx::coverage_server {

using Milliseconds = std::chrono::milliseconds;

class Connection final : public httplib::Stream {
public:
    // What the service notes of the request under way, begun anew with each.
    struct Exchange {
        bool isServed = false;      // false for what was too malformed
        std::uint64_t request = 0;  // its number in the log
        std::string fault;
        std::string reason;
        std::chrono::steady_clock::time_point begun;
    };
    Exchange exchange;

    // Owns the socket. Without a TLS context the connection is plain.
    Connection(std::uint64_t id, int socket, SSL_CTX* tls);
    ~Connection() override;
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;

    std::uint64_t id() const { return id_; }
    std::uint64_t requests() const { return requests_; }
    std::uint64_t bytesSent() const { return bytesSent_; }

    // False when TLS could not be agreed on.
    bool handshake();
    // Waits for the first bytes of another request; false when none come in time or the connection has ended.
    bool awaitRequest(Milliseconds idle);
    // Wakes whatever the connection waits for and makes it fail from now on.
    void shutDown();

    // For faults.
    // What is written from now on to the end of this answer is swallowed. The status is the one on the wire, 0 for
    // none.
    void takeOver(int status);
    bool isTakenOver() const { return isTakenOver_; }
    int status() const { return status_; }
    // Sends past the take-over; false when the client has gone.
    bool send(std::string_view bytes);
    // False when the client has gone, or the server is ending, before the time is over.
    bool pause(Milliseconds time);
    void holdUntilClientLeaves();
    // No other request is served, and the client sees the end at once, a reset instead of an orderly end if so asked.
    void endAbruptly(bool withReset);
    bool isToEnd() const { return isToEnd_; }

    // httplib::Stream
    bool is_readable() const override { return true; }
    bool is_writable() const override { return true; }
    ssize_t read(char* bytes, std::size_t size) override;
    ssize_t write(const char* bytes, std::size_t size) override;
    void get_remote_ip_and_port(std::string& ip, int& port) const override;
    void get_local_ip_and_port(std::string& ip, int& port) const override;
    socket_t socket() const override { return socket_; }

private:
    bool fill(Milliseconds longest);

    struct TlsFreed {
        void operator()(SSL* tls) const { SSL_free(tls); }
    };

    const std::uint64_t id_;
    const int socket_;
    std::unique_ptr<SSL, TlsFreed> tls_;

    std::string received_;  // of which the first consumed_ bytes have been read
    std::size_t consumed_ = 0;
    std::size_t requestBytes_ = 0;
    std::chrono::steady_clock::time_point deadline_;
    std::uint64_t requests_ = 0;
    std::uint64_t bytesSent_ = 0;

    bool isTakenOver_ = false;
    int status_ = 0;
    bool isToEnd_ = false;
    bool isAbrupt_ = false;
};

}  // namespace vrx::coverage_server
