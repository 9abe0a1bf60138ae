// The agent's end of one client's socket, speaking D-Bus: authenticates the client and dispatches its messages. It
// answers Hello, which stock tools send first although there is no bus daemon. Made on any thread and then used by one.
//
// It reads the socket itself and hands sd-bus one line or one whole message at a time: sd-bus tells neither who wrote
// the bytes nor how long a message is to become before it has read it, nor does it look at the body beyond what is
// asked for.
#pragma once

#include <sys/types.h>
#include <systemd/sd-bus.h>

#include <bit>
#include <cstdint>
#include <string>
#include <string_view>

#include "vrx/host/base/descriptor.h"

namespace vrx::host {

class ServerBus {
public:
    enum class Step {
        Progress,  // there may be more to do at once
        Idle,      // nothing more until the socket is ready
        Ended,     // the client has gone, or was cut off
    };

    // Only what that process writes is accepted.
    ServerBus(Descriptor socket, pid_t peer);
    ~ServerBus();
    ServerBus(const ServerBus&) = delete;
    ServerBus& operator=(const ServerBus&) = delete;

    // Takes one step: a part of the authentication, or one message. Repeat it until it returns Idle before each wait.
    Step step();

    bool isAuthenticated() const;
    // Nothing more can come, but replies may still be sent.
    bool isReadToTheEnd() const { return isReadToTheEnd_; }
    std::size_t unsentMessages() const;

    // The body of the message that is being handled.
    std::string_view body() const;
    std::endian byteOrder() const;

    // For a poll(): what to wait for on the socket.
    int socket() const { return socket_; }
    short events() const;

    sd_bus* bus() const { return bus_; }

private:
    static int onMessage(sd_bus_message* message, void* self, sd_bus_error*);
    bool passOn();
    std::size_t nextLength();
    std::uint64_t numberAt(std::size_t position) const;
    bool receive();
    bool hasHungUp() const;

    sd_bus* bus_ = nullptr;
    int socket_;
    const pid_t peer_;
    Descriptor input_;          // what is written to it, sd-bus reads
    int state_ = 0;             // of sd-bus: 0 when it has taken in all; a negative errno once the connection is over
    std::string received_;      // begins with what was passed on last
    std::size_t passedOn_ = 0;  // bytes
    bool isReadToTheEnd_ = false;
};

}  // namespace vrx::host
