#include "coverage_server/http_server.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <limits>
#include <system_error>

namespace vrx::coverage_server {

namespace {

constexpr std::size_t connectionsAtMost = 256;
constexpr std::size_t bodyBytesAtMost = 1024 * 1024;

// The library's handlers get no hold of the stream that it reads from: this is the one of the calling thread.
thread_local Connection* servedConnection = nullptr;

[[noreturn]] void fail(const char* what) {
    throw std::system_error(errno, std::generic_category(), what);
}

}  // namespace

HttpServer::HttpServer(HttpService& service, int port, SSL_CTX* tls, std::chrono::seconds keepAlive)
    : service_(service), tls_(tls), keepAlive_(keepAlive), listener_(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    auto serve = [this](const httplib::Request& request, httplib::Response& response) {
        servedConnection->exchange.isServed = true;
        service_.serve(request, response, *servedConnection);
    };
    Get(".*", serve).Post(".*", serve).Put(".*", serve).Patch(".*", serve).Delete(".*", serve).Options(".*", serve);
    set_logger([this](const httplib::Request& request, const httplib::Response& response) {
        service_.answered(request, response, *servedConnection);
    });
    set_payload_max_length(bodyBytesAtMost);
    set_keep_alive_timeout(keepAlive.count());
    set_keep_alive_max_count(std::numeric_limits<int>::max());

    if (listener_ < 0) fail("socket");
    const int on = 1;
    setsockopt(listener_, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    socklen_t size = sizeof address;
    if (bind(listener_, reinterpret_cast<sockaddr*>(&address), size) != 0 || ::listen(listener_, SOMAXCONN) != 0 ||
        getsockname(listener_, reinterpret_cast<sockaddr*>(&address), &size) != 0) {
        const int error = errno;
        close(listener_);
        errno = error;
        fail(("cannot listen on port " + std::to_string(port)).c_str());
    }
    port_ = ntohs(address.sin_port);
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
    lock.lock();
    isEmpty_.wait(lock, [this] { return threads_ == 0; });
}

void HttpServer::accept() {
    for (std::uint64_t id = 1;; ++id) {
        const int socket = accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC);
        std::unique_lock lock(mutex_);
        if (isEnding_) {
            if (socket >= 0) close(socket);
            return;
        }
        const bool isOne = threads_ < connectionsAtMost && socket >= 0;
        if (isOne) ++threads_;
        lock.unlock();
        if (isOne) {
            try {
                std::thread([this, socket, id] { serveConnection(socket, id); }).detach();
                continue;
            } catch (const std::system_error&) {
                lock.lock();
                --threads_;
                lock.unlock();
            }
        }
        service_.refused();
        // Without descriptors there is nothing to accept for a while.
        if (socket >= 0)
            close(socket);
        else
            std::this_thread::sleep_for(Milliseconds(10));
    }
}

void HttpServer::serveConnection(int socket, std::uint64_t id) {
    {
        Connection connection(id, socket, tls_);
        std::unique_lock lock(mutex_);
        connections_.insert(&connection);
        if (isEnding_) connection.shutDown();
        lock.unlock();

        servedConnection = &connection;
        if (service_.admit(connection)) {
            if (!connection.handshake()) {
                service_.handshakeFailed(connection);
            } else {
                const auto idle = keepAlive_.count() ? keepAlive_ : std::chrono::seconds(30);
                // A compressed body is left as it is, since what a few bytes inflate to has no limit: the library
                // looks for the header under its own name.
                auto adjust = [](httplib::Request& request) {
                    if (auto header = request.headers.extract("Content-Encoding")) {
                        header.key() = "Content-Encoding-Received";
                        request.headers.insert(std::move(header));
                    }
                    // Without a length there is no body: the library would read to the end of the connection.
                    if (!request.has_header("Content-Length") && !request.has_header("Transfer-Encoding"))
                        request.headers.emplace("Content-Length", "0");
                };
                bool isClosed = false;
                while (!isClosed && connection.awaitRequest(idle)) {
                    if (!process_request(connection, keepAlive_.count() == 0, isClosed, adjust)) break;
                    // Where the next request would begin after a malformed one, nobody knows.
                    if (!connection.exchange.isServed) break;
                }
            }
        }
        service_.ended(connection);

        lock.lock();
        connections_.erase(&connection);
    }
    std::lock_guard lock(mutex_);
    if (--threads_ == 0) isEmpty_.notify_all();
}

}  // namespace vrx::coverage_server
