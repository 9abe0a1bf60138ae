#include "vrx/host/ipc/server_bus.h"

#include <poll.h>
#include <sys/socket.h>

#include <array>
#include <cerrno>
#include <cstring>

#include "vrx/platform/limits.h"

namespace vrx::host {

namespace {

// Far above what a request needs. sd-bus alone would accept 128 MiB.
constexpr std::uint64_t messageBytes = platform::limits::documentBytes;

int answerHello(sd_bus_message* message, void*, sd_bus_error*) {
    if (sd_bus_message_is_method_call(message, "org.freedesktop.DBus", "Hello") <= 0) return 0;
    const int r = sd_bus_reply_method_return(message, "s", ":1.1");
    return r < 0 ? r : 1;
}

std::uint32_t numberAt(const std::array<unsigned char, 16>& header, std::size_t position) {
    std::uint32_t number;
    std::memcpy(&number, header.data() + position, sizeof number);
    constexpr unsigned char nativeOrder = 'l';
    return header[0] == nativeOrder ? number : __builtin_bswap32(number);
}

// Whether these bytes begin a message that is too long. Bytes in the middle of a message can look like it only by
// chance, and only in one that is long already.
bool beginsLongMessage(const std::array<unsigned char, 16>& header) {
    const bool isHeader =
        (header[0] == 'l' || header[0] == 'B') && header[1] >= 1 && header[1] <= 4 && header[2] < 8 && header[3] == 1;
    return isHeader && std::uint64_t{numberAt(header, 4)} + numberAt(header, 12) > messageBytes;
}

}  // namespace

ServerBus::ServerBus(Descriptor socket, pid_t peer) : socket_(socket.number()), peer_(peer) {
    const int on = 1;  // for a connection that was made before the listener had it
    setsockopt(socket_, SOL_SOCKET, SO_PASSCRED, &on, sizeof on);
    sd_id128_t identifier{};
    auto tryTo = [this](int result) { state_ = state_ < 0 ? state_ : result; };
    tryTo(sd_id128_randomize(&identifier));
    tryTo(sd_bus_new(&bus_));
    if (state_ < 0) return;
    tryTo(sd_bus_set_fd(bus_, socket_, socket_));
    if (state_ >= 0) socket.release();
    tryTo(sd_bus_set_server(bus_, 1, identifier));
    tryTo(sd_bus_negotiate_fds(bus_, 0));
    tryTo(sd_bus_set_trusted(bus_, 1));  // who may call was decided at the connection
    tryTo(sd_bus_start(bus_));
    tryTo(sd_bus_add_filter(bus_, nullptr, answerHello, nullptr));
}

ServerBus::~ServerBus() {
    sd_bus_close_unref(bus_);
}

ServerBus::Step ServerBus::step() {
    if (state_ >= 0) {
        const Incoming incoming = examineIncoming();
        // Otherwise sd-bus would read bytes that arrived after this examination.
        if (incoming == Incoming::Nothing && isDrained_ && !hasQueued()) return Step::Idle;
        state_ = incoming == Incoming::Refused ? -EACCES : sd_bus_process(bus_, nullptr);
        isDrained_ = isDrained_ || (state_ == 0 && isAuthenticated());
    }
    if (state_ < 0 || sd_bus_is_open(bus_) <= 0) return Step::Ended;
    return state_ > 0 ? Step::Progress : Step::Idle;
}

// Peeks at what sd-bus reads next: who wrote it, and the length of the message that begins there. sd-bus tells neither.
// It reads a message in several reads, but never beyond it in one step, and the kernel never joins in one read what
// different processes wrote: so no message begins with another process's bytes.
ServerBus::Incoming ServerBus::examineIncoming() const {
    std::array<unsigned char, 16> header{};
    iovec content{header.data(), header.size()};
    // No room for descriptors: peeking would leave copies of them open here.
    alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(ucred))> control;
    msghdr peeked{};
    peeked.msg_iov = &content;
    peeked.msg_iovlen = 1;
    peeked.msg_control = control.data();
    peeked.msg_controllen = control.size();
    const ssize_t size = recvmsg(socket_, &peeked, MSG_PEEK | MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
    if (size < 0 && errno == EAGAIN) return Incoming::Nothing;
    if (size <= 0) return Incoming::End;
    if (size == static_cast<ssize_t>(header.size()) && beginsLongMessage(header)) return Incoming::Refused;
    for (cmsghdr* part = CMSG_FIRSTHDR(&peeked); part; part = CMSG_NXTHDR(&peeked, part)) {
        if (part->cmsg_level != SOL_SOCKET || part->cmsg_type != SCM_CREDENTIALS) continue;
        ucred writer;
        std::memcpy(&writer, CMSG_DATA(part), sizeof writer);
        return writer.pid == peer_ ? Incoming::Admitted : Incoming::Refused;
    }
    return Incoming::Refused;
}

bool ServerBus::hasQueued() const {
    std::uint64_t read = 0;
    sd_bus_get_n_queued_read(bus_, &read);
    return read + unsentMessages() > 0;
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
    const int events = sd_bus_get_events(bus_);
    return events < 0 ? short{POLLIN} : static_cast<short>(events);
}

}  // namespace vrx::host
