#include "coverage_server/connection.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <openssl/ssl.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>

namespace vrx::coverage_server {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr std::size_t requestBytesAtMost = 2 * 1024 * 1024;
constexpr Milliseconds requestTimeAtMost = std::chrono::seconds(30);
constexpr timeval stalledAtMost{.tv_sec = 60, .tv_usec = 0};  // of a client that takes nothing of what is sent

int pollTime(Milliseconds time) {
    return static_cast<int>(std::clamp<Milliseconds::rep>(time.count(), 0, INT_MAX));
}

Milliseconds until(SteadyClock::time_point end) {
    return std::chrono::ceil<Milliseconds>(end - SteadyClock::now());
}

void addressOf(int socket, decltype(getpeername) name, std::string& ip, int& port) {
    sockaddr_in address{};
    socklen_t size = sizeof address;
    std::array<char, INET_ADDRSTRLEN> text{};
    if (name(socket, reinterpret_cast<sockaddr*>(&address), &size) != 0) return;
    ip = inet_ntop(AF_INET, &address.sin_addr, text.data(), text.size());
    port = ntohs(address.sin_port);
}

}  // namespace

Connection::Connection(std::uint64_t id, int socket, SSL_CTX* tls) : id_(id), socket_(socket) {
    const int on = 1;
    setsockopt(socket_, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
    setsockopt(socket_, SOL_SOCKET, SO_SNDTIMEO, &stalledAtMost, sizeof stalledAtMost);
    setsockopt(socket_, SOL_SOCKET, SO_RCVTIMEO, &stalledAtMost, sizeof stalledAtMost);
    if (!tls) return;
    tls_.reset(SSL_new(tls));
    if (tls_) SSL_set_fd(tls_.get(), socket_);
}

Connection::~Connection() {
    if (tls_ && !isAbrupt_ && SSL_is_init_finished(tls_.get())) SSL_shutdown(tls_.get());
    close(socket_);
}

bool Connection::handshake() {
    return !tls_ || SSL_accept(tls_.get()) == 1;
}

void Connection::shutDown() {
    shutdown(socket_, SHUT_RDWR);
}

bool Connection::awaitRequest(Milliseconds idle) {
    isTakenOver_ = false;
    requestBytes_ = 0;
    if (isToEnd_ || (consumed_ == received_.size() && !fill(idle))) return false;
    requestBytes_ = received_.size() - consumed_;
    exchange = {};
    exchange.begun = SteadyClock::now();
    deadline_ = exchange.begun + requestTimeAtMost;
    ++requests_;
    return true;
}

// Receives into the buffer, which is empty; false when nothing came.
bool Connection::fill(Milliseconds longest) {
    constexpr std::size_t pieceBytes = 16 * 1024;
    const SteadyClock::time_point end = SteadyClock::now() + longest;
    received_.resize(pieceBytes);
    consumed_ = 0;
    while (true) {
        pollfd file{.fd = socket_, .events = POLLIN, .revents = 0};
        const bool hasBytes = tls_ && SSL_has_pending(tls_.get());
        const int ready = hasBytes ? 1 : poll(&file, 1, pollTime(until(end)));
        if (ready < 0 && errno == EINTR) continue;
        if (ready <= 0) break;
        ssize_t count;
        if (tls_) {
            count = SSL_read(tls_.get(), received_.data(), static_cast<int>(pieceBytes));
            if (count <= 0 && SSL_get_error(tls_.get(), static_cast<int>(count)) == SSL_ERROR_WANT_READ) continue;
        } else {
            count = recv(socket_, received_.data(), pieceBytes, 0);
        }
        if (count <= 0) break;
        received_.resize(static_cast<std::size_t>(count));
        requestBytes_ += received_.size();
        return true;
    }
    received_.clear();
    return false;
}

ssize_t Connection::read(char* bytes, std::size_t size) {
    if (consumed_ == received_.size()) {
        if (requestBytes_ > requestBytesAtMost || until(deadline_) <= Milliseconds(0)) return -1;
        if (!fill(until(deadline_))) return -1;
    }
    const std::size_t count = std::min(size, received_.size() - consumed_);
    std::copy_n(received_.data() + consumed_, count, bytes);
    consumed_ += count;
    return static_cast<ssize_t>(count);
}

ssize_t Connection::write(const char* bytes, std::size_t size) {
    if (isTakenOver_) return static_cast<ssize_t>(size);
    return send({bytes, size}) ? static_cast<ssize_t>(size) : -1;
}

bool Connection::send(std::string_view bytes) {
    while (!bytes.empty()) {
        const ssize_t count =
            tls_ ? SSL_write(tls_.get(), bytes.data(), static_cast<int>(std::min<std::size_t>(bytes.size(), INT_MAX)))
                 : ::send(socket_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
        if (count < 0 && !tls_ && errno == EINTR) continue;
        if (count <= 0) {
            isToEnd_ = true;
            return false;
        }
        bytesSent_ += static_cast<std::uint64_t>(count);
        bytes.remove_prefix(static_cast<std::size_t>(count));
    }
    return true;
}

void Connection::takeOver(int status) {
    isTakenOver_ = true;
    status_ = status;
}

bool Connection::pause(Milliseconds time) {
    const SteadyClock::time_point end = SteadyClock::now() + time;
    while (until(end) > Milliseconds(0)) {
        pollfd file{.fd = socket_, .events = POLLRDHUP, .revents = 0};
        const int ready = poll(&file, 1, pollTime(until(end)));
        if (ready > 0) {
            isToEnd_ = true;
            return false;
        }
        if (ready < 0 && errno != EINTR) return false;
    }
    return true;
}

void Connection::holdUntilClientLeaves() {
    while (pause(std::chrono::hours(1))) {
    }
}

void Connection::endAbruptly(bool withReset) {
    isToEnd_ = true;
    isAbrupt_ = true;
    if (!withReset) return;
    const linger atOnce{.l_onoff = 1, .l_linger = 0};
    setsockopt(socket_, SOL_SOCKET, SO_LINGER, &atOnce, sizeof atOnce);
}

void Connection::get_remote_ip_and_port(std::string& ip, int& port) const {
    addressOf(socket_, getpeername, ip, port);
}

void Connection::get_local_ip_and_port(std::string& ip, int& port) const {
    addressOf(socket_, getsockname, ip, port);
}

}  // namespace vrx::coverage_server
