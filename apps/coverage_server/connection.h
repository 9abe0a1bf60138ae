// A client's connection, plain or TLS: its requests are read from it, and answers are sent on it. A fault takes an
// answer over: it sends its own bytes, and the genuine answer is dropped.
//
// One thread at a time may use it; shutDown() alone may be called by any other. There are limits
// to the size of a request, to the time in which it must arrive, and to the time for which a client may take nothing of
// what is sent.
#pragma once

#include <openssl/ssl.h>
#include <sys/types.h>

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

namespace vrx::coverage_server {

using Milliseconds = std::chrono::milliseconds;

class Connection final {
public:
    // What is known of the request under way; begun anew with each.
    struct Exchange {
        bool isServed = false;      // false for a malformed request
        bool isLast = true;         // the connection ends after it
        std::uint64_t request = 0;  // its number in the log
        std::string asked;          // its method and target
        std::string fault;
        std::string reason;
        std::chrono::steady_clock::time_point begun;
    };
    Exchange exchange;

    // Owns the socket. Without a TLS context the connection is plain.
    Connection(std::uint64_t id, int socket, SSL_CTX* tls);
    ~Connection();
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;

    std::uint64_t id() const { return id_; }
    std::uint64_t requests() const { return requests_; }
    std::uint64_t bytesSent() const { return bytesSent_; }

    // False when there is no agreement on TLS.
    bool handshake();
    // Waits for the first bytes of the next request; false when none come in time or the connection has ended.
    bool awaitRequest(Milliseconds idle);
    // Append to the text what comes next, waiting for it: everything up to the end of a line, or so many bytes. False
    // when the request ends before that: the client has left, or a bound is exceeded.
    bool readLine(std::string& text);
    bool read(std::string& text, std::size_t count);
    // Sends the genuine answer, unless a fault has taken it over.
    void answer(int status, std::string_view bytes);
    // Fails whatever the connection waits for, now and later.
    void shutDown();

    // For faults.
    // The fault answers, with this status on the wire, 0 for none.
    void takeOver(int status);
    // The status of the answer, 0 for none.
    int status() const { return status_; }
    // False when the client has gone.
    bool send(std::string_view bytes);
    // False when the client leaves, or the server ends, before the time is over.
    bool pause(Milliseconds time);
    void holdUntilClientLeaves();
    // Serves no other request. The client sees the connection's end at once, as a reset if asked for.
    void endAbruptly(bool withReset);

private:
    std::string_view unread();
    bool fill(Milliseconds longest);
    bool awaitBytes(std::chrono::steady_clock::time_point end);
    ssize_t receive();
    ssize_t sendSome(std::string_view bytes);

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
