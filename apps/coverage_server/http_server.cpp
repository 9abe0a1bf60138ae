#include "coverage_server/http_server.h"

#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <optional>
#include <string_view>
#include <system_error>

namespace vrx::coverage_server {

namespace {

constexpr std::size_t connectionsAtMost = 256;

std::string refusal(int status) {
    const char* const reason = status == 413 ? "Payload Too Large" : "Bad Request";
    return "HTTP/1.1 " + std::to_string(status) + " " + reason + "\r\nConnection: close\r\nContent-Length: 0\r\n\r\n";
}

// 0 for no answer.
int statusOf(std::string_view answer) {
    constexpr std::size_t begin = std::string_view("HTTP/1.1 ").size();
    int status = 0;
    if (answer.size() > begin) std::from_chars(answer.data() + begin, answer.data() + answer.size(), status);
    return status;
}

// The library announces the end of its own connection; the client's stays open.
void promiseToStay(std::string& answer, std::chrono::seconds time) {
    constexpr std::string_view promised = "\r\nConnection: close\r\n";
    const std::size_t at = answer.find(promised);
    if (at < answer.find("\r\n\r\n"))
        answer.replace(at, promised.size(), "\r\nKeep-Alive: timeout=" + std::to_string(time.count()) + "\r\n");
}

}  // namespace

HttpServer::HttpServer(HttpService& service, int port, SSL_CTX* tls, std::chrono::seconds keepAlive)
    : service_(service),
      tls_(tls),
      keepAlive_(keepAlive),
      listener_(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)),
      backEnd_(service),
      threads_(connectionsAtMost) {
    try {
        listen(port);
    } catch (...) {
        close(listener_);
        throw;
    }
    acceptor_ = std::thread([this] { accept(); });
}

HttpServer::~HttpServer() {
    std::unique_lock lock(mutex_);
    isEnding_ = true;
    for (Connection* connection : connections_) connection->shutDown();
    lock.unlock();
    shutdown(listener_, SHUT_RDWR);
    acceptor_.join();
    close(listener_);
    threads_.wait();
}

void HttpServer::listen(int port) {
    const int on = 1;
    setsockopt(listener_, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    socklen_t size = sizeof address;
    auto* const generic = reinterpret_cast<sockaddr*>(&address);
    if (bind(listener_, generic, size) != 0 || ::listen(listener_, SOMAXCONN) != 0 ||
        getsockname(listener_, generic, &size) != 0)
        throw std::system_error(errno, std::generic_category(), "cannot listen on port " + std::to_string(port));
    port_ = ntohs(address.sin_port);
}

void HttpServer::accept() {
    for (std::uint64_t id = 1;; ++id) {
        const int socket = accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC);
        const bool isOver = isEnding();
        if (socket >= 0 && !isOver && threads_.start([this, socket, id] { serveConnection(socket, id); })) continue;
        if (socket >= 0) close(socket);
        if (isOver) return;
        service_.refused();
        // Without descriptors there is nothing to accept for a while.
        if (socket < 0) std::this_thread::sleep_for(Milliseconds(10));
    }
}

bool HttpServer::isEnding() {
    std::lock_guard lock(mutex_);
    return isEnding_;
}

void HttpServer::serveConnection(int socket, std::uint64_t id) {
    Connection connection(id, socket, tls_);
    std::unique_lock lock(mutex_);
    connections_.insert(&connection);
    if (isEnding_) connection.shutDown();
    lock.unlock();

    if (service_.admit(connection)) {
        if (connection.handshake())
            serveRequests(connection);
        else
            service_.handshakeFailed(connection);
    }
    service_.ended(connection);

    lock.lock();
    connections_.erase(&connection);
}

void HttpServer::serveRequests(Connection& connection) {
    const std::chrono::seconds idle = keepAlive_.count() ? keepAlive_ : std::chrono::seconds(30);
    Connection::Exchange& exchange = connection.exchange;
    do {
        if (!connection.awaitRequest(idle)) return;
        const std::optional<ClientRequest> request = readRequest(connection);
        if (!request) return;
        const std::string answer = answerTo(*request, connection);
        connection.answer(statusOf(answer), answer);
        service_.answered(connection);
    } while (!exchange.isLast);
}

std::string HttpServer::answerTo(const ClientRequest& request, Connection& connection) {
    if (request.refusal) return refusal(request.refusal);
    std::string answer = backEnd_.answer(request, connection);
    if (keepAlive_.count() == 0) connection.exchange.isLast = true;
    if (!connection.exchange.isLast) promiseToStay(answer, keepAlive_);
    return answer;
}

}  // namespace vrx::coverage_server
