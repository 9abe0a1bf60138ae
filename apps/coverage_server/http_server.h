// An HTTP server on loopback whose service is handed the connection along with the request, so that it can also
// misbehave below HTTP. The library reads the requests and writes the answers; listening and the connections are our
// own, since the library's server lets nobody near a connection, answers from a small pool that a few unanswered
// requests would exhaust, and waits for its clients when it is to end. One port therefore serves good and bad answers
// alike, plain or TLS.
#pragma once

#include <httplib.h>

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <set>
#include <string>
#include <thread>

#include "coverage_server/connection.h"

namespace vrx::coverage_server {

// What a server does with its connections and requests. Called on the connections' threads, several at a time.
class HttpService {
public:
    virtual ~HttpService() = default;
    // A new connection, nothing of it read yet; false to close it.
    virtual bool admit(Connection&) { return true; }
    virtual void handshakeFailed(const Connection&) {}
    virtual void serve(const httplib::Request& request, httplib::Response& response, Connection& connection) = 0;
    // The answer has been written. The request may be one that was too malformed to be served.
    virtual void answered(const httplib::Request&, const httplib::Response&, const Connection&) {}
    virtual void ended(const Connection&) {}
    // There are too many connections; one more has been closed.
    virtual void refused() {}
};

class HttpServer final : private httplib::Server {
public:
    // Service and TLS context must outlive the server. Throws std::system_error when the port cannot be had; port 0
    // takes any. With a keep-alive of 0 every connection serves one request.
    HttpServer(HttpService& service, int port, SSL_CTX* tls, std::chrono::seconds keepAlive);
    // Ends all connections.
    ~HttpServer() override;

    int port() const { return port_; }

private:
    void accept();
    void serveConnection(int socket, std::uint64_t id);

    HttpService& service_;
    SSL_CTX* const tls_;
    const std::chrono::seconds keepAlive_;
    const int listener_;
    int port_ = 0;

    std::mutex mutex_;
    std::condition_variable isEmpty_;
    bool isEnding_ = false;
    std::size_t threads_ = 0;
    std::set<Connection*> connections_;

    std::thread acceptor_;
};

}  // namespace vrx::coverage_server
