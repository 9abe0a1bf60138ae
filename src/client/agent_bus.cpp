#include "vrx/client/agent_bus.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>

#include "vrx/client/property_reader.h"
#include "vrx/wire/encoding.h"
#include "vrx/wire/message.h"

namespace vrx::client {

using platform::Error;
using platform::MaybeError;
using wire::MessagePointer;

namespace {

// Never 0, because the calls below take 0 for "no limit" or "the default".
std::uint64_t microsecondsUntil(Deadline deadline) {
    using namespace std::chrono;
    return static_cast<std::uint64_t>(
        std::max<std::int64_t>(1, ceil<microseconds>(deadline - steady_clock::now()).count()));
}

bool meansEnded(int error) {
    return error == ECONNRESET || error == ENOTCONN || error == EPIPE || error == ESHUTDOWN || error == ECONNABORTED ||
           error == ECONNREFUSED;
}

MaybeError cannotConnect(const std::string& path, int error) {
    return Error{platform::error_domain::client, error, "no agent answers at " + path + ": " + std::strerror(error)};
}

// Owns what sd-bus fills in.
struct BusError {
    sd_bus_error error{};
    ~BusError() { sd_bus_error_free(&error); }
    bool is(const char* name) const { return sd_bus_error_has_name(&error, name) > 0; }
    std::string text() const { return error.message ? error.message : error.name ? error.name : "unknown error"; }
};

CallResult failed(int result, const BusError& error) {
    using enum Failure::Kind;
    using enum Failure::Refusal;
    if (result == -ETIMEDOUT) return Failure{TimedOut, "the agent has not replied in time"};
    if (meansEnded(-result)) return ConnectionEnded{"the connection ended before the reply"};
    if (error.is(wire::noReply)) return ConnectionEnded{error.text()};
    if (error.is(wire::accessDenied)) return Failure{Refused, error.text(), Entitlement};
    if (error.is(wire::limitsExceeded)) return Failure{Refused, error.text(), Limit};
    if (error.is(wire::invalidArguments)) return Failure{Refused, error.text(), Argument};
    return Failure{BadReply, error.text()};
}

}  // namespace

MaybeError AgentBus::open(const std::string& path, Deadline deadline) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (path.size() >= sizeof address.sun_path) return cannotConnect(path, ENAMETOOLONG);
    std::memcpy(address.sun_path, path.c_str(), path.size());

    const int file = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (file < 0) return cannotConnect(path, errno);
    // A busy agent lets clients wait in its queue; when that is full, connect() waits up to this limit.
    const std::uint64_t wait = microsecondsUntil(deadline);
    const timeval limit{static_cast<time_t>(wait / 1'000'000), static_cast<suseconds_t>(wait % 1'000'000)};
    setsockopt(file, SOL_SOCKET, SO_SNDTIMEO, &limit, sizeof limit);
    int r = connect(file, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0 ? 0 : -errno;
    if (r == -EAGAIN) r = -ETIMEDOUT;  // this is how the limit shows
    if (r >= 0) r = sd_bus_new(&bus_);
    if (r >= 0) r = sd_bus_set_fd(bus_, file, file);
    if (r < 0) {
        ::close(file);
        return cannotConnect(path, -r);
    }
    socket_ = file;
    return std::nullopt;
}

int AgentBus::authenticate(Deadline deadline) {
    int r = sd_bus_is_open(bus_) > 0 ? 1 : sd_bus_start(bus_);
    while (r >= 0 && sd_bus_is_ready(bus_) == 0) {
        r = sd_bus_process(bus_, nullptr);
        if (r == 0) r = sd_bus_wait(bus_, microsecondsUntil(deadline));
        if (r == 0 && std::chrono::steady_clock::now() >= deadline) r = -ETIMEDOUT;
    }
    return r;
}

// Order: authenticate, append, send. The first failure ends the call; a refused argument never reaches the agent.
CallResult AgentBus::call(const wire::Operation& operation, const CallArguments& arguments, Deadline deadline,
                          const wire::Interface& interface) {
    BusError error;
    if (int r = authenticate(deadline); r < 0) return failed(r, error);

    sd_bus_message* message = nullptr;
    int r = sd_bus_message_new_method_call(bus_, &message, wire::serviceName, interface.path, interface.name,
                                           operation.member);
    const MessagePointer call(message);
    if (r >= 0) r = appendArguments(message, operation.signature, arguments);
    if (r == -EINVAL)
        return Failure{Failure::Kind::Refused,
                       "an argument holds what the bus does not carry: text in UTF-8 without NUL it does",
                       Failure::Refusal::Argument};
    if (r < 0) return failed(r, error);

    r = sd_bus_call(bus_, message, microsecondsUntil(deadline), &error.error, &message);
    if (r < 0) return failed(r, error);
    const MessagePointer reply(message);
    platform::Result<platform::Value> root =
        &operation == &wire::getAllProperties ? readProperties(message) : wire::readReply(message);
    if (!root) return Failure{Failure::Kind::BadReply, root.error().text};
    return std::move(root).value();
}

int AgentBus::appendArguments(sd_bus_message* message, const char* signature, const CallArguments& arguments) {
    for (const char* type = signature; *type != '\0'; ++type) {
        int r = 0;
        if (*type == 's') {
            if (!wire::isCarriedAsString(arguments.text)) return -EINVAL;
            r = sd_bus_message_append_basic(message, *type, std::string(arguments.text).c_str());
        } else if (*type == 't') {
            r = sd_bus_message_append_basic(message, *type, &arguments.policy);
        } else {
            const int flag = arguments.flag ? 1 : 0;
            r = sd_bus_message_append_basic(message, *type, &flag);
        }
        if (r < 0) return r;
    }
    return 0;
}

void AgentBus::setOnChanged(std::function<void(std::string_view)> onChanged) {
    onChanged_ = std::move(onChanged);
    sd_bus_add_filter(bus_, nullptr, onMessage, this);
}

int AgentBus::onMessage(sd_bus_message* message, void* self, sd_bus_error*) {
    const char* interface = sd_bus_message_get_interface(message);
    if (interface && sd_bus_message_is_signal(message, interface, wire::changedMember) > 0)
        static_cast<AgentBus*>(self)->onChanged_(interface);
    return 0;
}

void AgentBus::listen(int wakeFile) {
    while (true) {
        int r = sd_bus_process(bus_, nullptr);
        if (r > 0) continue;
        const int events = r < 0 ? r : sd_bus_get_events(bus_);
        if (events < 0) return;
        std::array<pollfd, 2> files{{{socket_, static_cast<short>(events), 0}, {wakeFile, POLLIN, 0}}};
        if (poll(files.data(), files.size(), -1) < 0 && errno != EINTR) return;
        if (files[1].revents) return;
    }
}

void AgentBus::interrupt() const {
    shutdown(socket_, SHUT_RDWR);
}

}  // namespace vrx::client
