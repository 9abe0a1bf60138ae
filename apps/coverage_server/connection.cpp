#include "coverage_server/connection.h"

#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>

namespace vrx::coverage_server {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr std::size_t requestBytesAtMost = 2 * 1024 * 1024;
constexpr Milliseconds requestTimeAtMost = std::chrono::seconds(30);
constexpr ssize_t nothingYet = -2;                            // a part of a TLS record has come
constexpr timeval stalledAtMost{.tv_sec = 60, .tv_usec = 0};  // by a client that takes nothing of what is sent

int pollTime(Milliseconds time) {
    return static_cast<int>(std::clamp<Milliseconds::rep>(time.count(), 0, INT_MAX));
}

Milliseconds until(SteadyClock::time_point end) {
    return std::chrono::ceil<Milliseconds>(end - SteadyClock::now());
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
    exchange = {};
    isTakenOver_ = false;
    status_ = 0;
    requestBytes_ = 0;
    if (isToEnd_ || (consumed_ == received_.size() && !fill(idle))) return false;
    requestBytes_ = received_.size() - consumed_;
    exchange.begun = SteadyClock::now();
    deadline_ = exchange.begun + requestTimeAtMost;
    ++requests_;
    return true;
}

bool Connection::readLine(std::string& text) {
    while (true) {
        const std::string_view bytes = unread();
        if (bytes.empty()) return false;
        const std::size_t end = bytes.find('\n');
        const std::size_t count = end == bytes.npos ? bytes.size() : end + 1;
        text += bytes.substr(0, count);
        consumed_ += count;
        if (end != bytes.npos) return true;
    }
}

bool Connection::read(std::string& text, std::size_t count) {
    while (count > 0) {
        const std::string_view bytes = unread().substr(0, count);
        if (bytes.empty()) return false;
        text += bytes;
        consumed_ += bytes.size();
        count -= bytes.size();
    }
    return true;
}

// The request's next bytes; none when there are no more.
std::string_view Connection::unread() {
    if (consumed_ == received_.size() && (requestBytes_ > requestBytesAtMost || !fill(until(deadline_)))) return {};
    return std::string_view(received_).substr(consumed_);
}

// Receives into the buffer, which is empty; false when nothing came.
bool Connection::fill(Milliseconds longest) {
    constexpr std::size_t pieceBytes = 16 * 1024;
    const SteadyClock::time_point end = SteadyClock::now() + longest;
    received_.resize(pieceBytes);
    consumed_ = 0;
    ssize_t count = nothingYet;
    while (count == nothingYet) count = awaitBytes(end) ? receive() : 0;
    received_.resize(static_cast<std::size_t>(std::max<ssize_t>(count, 0)));
    requestBytes_ += received_.size();
    return count > 0;
}

bool Connection::awaitBytes(SteadyClock::time_point end) {
    if (tls_ && SSL_has_pending(tls_.get())) return true;
    while (true) {
        pollfd file{.fd = socket_, .events = POLLIN, .revents = 0};
        const int ready = poll(&file, 1, pollTime(until(end)));
        if (ready >= 0 || errno != EINTR) return ready > 0;
    }
}

ssize_t Connection::receive() {
    if (!tls_) return recv(socket_, received_.data(), received_.size(), 0);
    const int count = SSL_read(tls_.get(), received_.data(), static_cast<int>(received_.size()));
    return count <= 0 && SSL_get_error(tls_.get(), count) == SSL_ERROR_WANT_READ ? nothingYet : count;
}

void Connection::answer(int status, std::string_view bytes) {
    if (isTakenOver_) return;
    status_ = status;
    send(bytes);
}

bool Connection::send(std::string_view bytes) {
    while (!bytes.empty()) {
        const ssize_t count = sendSome(bytes);
        if (count <= 0) {
            isToEnd_ = true;
            return false;
        }
        bytesSent_ += static_cast<std::uint64_t>(count);
        bytes.remove_prefix(static_cast<std::size_t>(count));
    }
    return true;
}

ssize_t Connection::sendSome(std::string_view bytes) {
    if (tls_)
        return SSL_write(tls_.get(), bytes.data(), static_cast<int>(std::min<std::size_t>(bytes.size(), INT_MAX)));
    while (true) {
        const ssize_t count = ::send(socket_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
        if (count >= 0 || errno != EINTR) return count;
    }
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

}  // namespace vrx::coverage_server
