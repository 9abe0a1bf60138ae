// An HTTP server on loopback whose service is handed the client's connection along with each request, so that it can
// also misbehave below HTTP, within TLS too. It is a relay: it accepts the clients' connections, ends TLS, reads one
// request after the other and passes the answers of the HTTP library, which it keeps behind itself (BackEnd).
#pragma once

#include <chrono>
#include <cstdint>
#include <mutex>
#include <set>
#include <string>
#include <thread>

#include "coverage_server/back_end.h"
#include "coverage_server/http_service.h"
#include "coverage_server/threads.h"

namespace vrx::coverage_server {

class HttpServer final {
public:
    // The service and the TLS context must outlive the server. Throws std::system_error when it cannot listen on the
    // port; port 0 takes any. With a keep-alive of 0 every connection serves one request.
    HttpServer(HttpService& service, int port, SSL_CTX* tls, std::chrono::seconds keepAlive);
    // Ends all connections.
    ~HttpServer();
    HttpServer(const HttpServer&) = delete;
    HttpServer& operator=(const HttpServer&) = delete;

    int port() const { return port_; }

private:
    void listen(int port);
    void accept();
    bool isEnding();
    void serveConnection(int socket, std::uint64_t id);
    void serveRequests(Connection& connection);
    std::string answerTo(const ClientRequest& request, Connection& connection);

    HttpService& service_;
    SSL_CTX* const tls_;
    const std::chrono::seconds keepAlive_;
    const int listener_;
    int port_ = 0;

    std::mutex mutex_;
    bool isEnding_ = false;
    std::set<Connection*> connections_;

    BackEnd backEnd_;
    Threads threads_;  // one for each connection
    std::thread acceptor_;
};

}  // namespace vrx::coverage_server
