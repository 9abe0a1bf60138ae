#include "vrx/host/ipc/server_bus.h"

#include <endian.h>
#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <utility>

#include "vrx/platform/limits.h"

namespace vrx::host {

namespace {

// sd-bus alone would accept 128 MiB.
constexpr std::uint64_t messageBytes = platform::limits::requestBytes;
// A message's header of fixed size, and the places of two numbers in it. Fields and body follow.
constexpr std::size_t headerBytes = 16, bodyBytesAt = 4, fieldBytesAt = 12;

}  // namespace

ServerBus::ServerBus(Descriptor socket, pid_t peer) : socket_(socket.number()), peer_(peer) {
    const int on = 1;  // for a connection that was made before the listener had it
    setsockopt(socket_, SOL_SOCKET, SO_PASSCRED, &on, sizeof on);
    int ends[2] = {-1, -1};
    sd_id128_t identifier{};
    auto tryTo = [this](int result) { state_ = state_ < 0 ? state_ : result; };
    tryTo(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, ends) == 0 ? 0 : -errno);
    input_ = Descriptor(ends[0]);
    Descriptor output(ends[1]);
    tryTo(sd_id128_randomize(&identifier));
    tryTo(sd_bus_new(&bus_));
    if (state_ < 0) return;
    tryTo(sd_bus_set_fd(bus_, output.number(), socket_));
    if (state_ >= 0) {
        output.release();
        socket.release();
    }
    tryTo(sd_bus_set_server(bus_, 1, identifier));
    tryTo(sd_bus_set_anonymous(bus_, 1));  // who may call was decided at the connection
    tryTo(sd_bus_set_trusted(bus_, 1));
    tryTo(sd_bus_negotiate_fds(bus_, 0));
    tryTo(sd_bus_start(bus_));
    tryTo(sd_bus_add_filter(bus_, nullptr, onMessage, this));
    state_ = std::min(state_, 0);
}

ServerBus::~ServerBus() {
    sd_bus_close_unref(bus_);
}

int ServerBus::onMessage(sd_bus_message* message, void* self, sd_bus_error*) {
    static_cast<ServerBus*>(self)->state_ = 0;
    if (sd_bus_message_is_method_call(message, "org.freedesktop.DBus", "Hello") <= 0) return 0;
    const int r = sd_bus_reply_method_return(message, "s", ":1.1");
    return r < 0 ? r : 1;
}

ServerBus::Step ServerBus::step() {
    const bool hasMore = state_ > 0 || (state_ == 0 && passOn());
    if (state_ < 0 || (isReadToTheEnd_ && hasHungUp())) return Step::Ended;
    if (!hasMore && unsentMessages() == 0) return Step::Idle;
    state_ = sd_bus_process(bus_, nullptr);
    if (state_ < 0 || sd_bus_is_open(bus_) <= 0) return Step::Ended;
    return hasMore || state_ > 0 ? Step::Progress : Step::Idle;
}

// Gives sd-bus the next line of the authentication, or the next message. Whether there was one.
bool ServerBus::passOn() {
    received_.erase(0, std::exchange(passedOn_, 0));
    std::size_t length = nextLength();
    while (length == 0 && receive()) length = nextLength();
    if (length == 0) return false;
    const ssize_t sent = send(input_.number(), received_.data(), length, MSG_DONTWAIT | MSG_NOSIGNAL);
    if (sent != static_cast<ssize_t>(length)) state_ = sent < 0 ? -errno : -ENOBUFS;
    passedOn_ = length;
    return state_ >= 0;
}

// The length of the line or message with which the bytes begin; 0 when the rest of it is to come. One that is too long
// ends the connection.
std::size_t ServerBus::nextLength() {
    if (!isAuthenticated()) {
        const auto end = received_.find("\r\n");
        if (end == received_.npos && received_.size() > messageBytes) state_ = -EMSGSIZE;
        return end == received_.npos ? 0 : end + 2;
    }
    if (received_.size() < headerBytes) return 0;
    const std::uint64_t bodyBytes = numberAt(bodyBytesAt), fieldBytes = numberAt(fieldBytesAt);
    if (bodyBytes + fieldBytes > messageBytes) {
        state_ = -EMSGSIZE;
        return 0;
    }
    const std::uint64_t length = headerBytes + (fieldBytes + 7) / 8 * 8 + bodyBytes;
    return length <= received_.size() ? length : 0;
}

// Of the message with which the bytes begin. sd-bus ends the connection at one that names no order.
std::endian ServerBus::byteOrder() const {
    return received_[0] == 'B' ? std::endian::big : std::endian::little;
}

std::uint64_t ServerBus::numberAt(std::size_t position) const {
    std::uint32_t number;
    std::memcpy(&number, received_.data() + position, sizeof number);
    return byteOrder() == std::endian::big ? be32toh(number) : le32toh(number);
}

std::string_view ServerBus::body() const {
    const auto size = static_cast<std::size_t>(numberAt(bodyBytesAt));
    return std::string_view(received_).substr(passedOn_ - size, size);
}

// Reads what has come, from the peer alone: the kernel never joins in one read what different processes wrote. Whether
// there was anything.
bool ServerBus::receive() {
    if (state_ < 0 || isReadToTheEnd_) return false;
    std::array<char, 4096> content;
    iovec place{content.data(), content.size()};
    // No room for descriptors.
    alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(ucred))> control;
    msghdr message{};
    message.msg_iov = &place;
    message.msg_iovlen = 1;
    message.msg_control = control.data();
    message.msg_controllen = control.size();
    const ssize_t size = recvmsg(socket_, &message, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
    if (size == 0) isReadToTheEnd_ = true;
    if (size < 0 && errno != EAGAIN && errno != EINTR) state_ = -errno;
    if (size <= 0) return false;
    ucred writer{};
    for (cmsghdr* part = CMSG_FIRSTHDR(&message); part; part = CMSG_NXTHDR(&message, part))
        if (part->cmsg_level == SOL_SOCKET && part->cmsg_type == SCM_CREDENTIALS)
            std::memcpy(&writer, CMSG_DATA(part), sizeof writer);
    if (writer.pid != peer_) {
        state_ = -EACCES;
        return false;
    }
    received_.append(content.data(), static_cast<std::size_t>(size));
    return true;
}

bool ServerBus::hasHungUp() const {
    pollfd file{socket_, 0, 0};
    return poll(&file, 1, 0) > 0 && (file.revents & (POLLHUP | POLLERR)) != 0;
}

bool ServerBus::isAuthenticated() const {
    return sd_bus_is_ready(bus_) > 0;
}

std::size_t ServerBus::unsentMessages() const {
    std::uint64_t count = 0;
    sd_bus_get_n_queued_write(bus_, &count);
    return count;
}

short ServerBus::events() const {
    const int ofBus = sd_bus_get_events(bus_);
    const int output = ofBus < 0 ? 0 : ofBus & POLLOUT;
    return static_cast<short>(output | (isReadToTheEnd_ ? 0 : POLLIN));
}

}  // namespace vrx::host
