// The agent's end of one client's socket, speaking D-Bus: authenticates the client and dispatches its messages. It
// answers Hello, which stock tools send first although there is no bus daemon. Made on any thread and then used by one.
#pragma once

#include <sys/types.h>
#include <systemd/sd-bus.h>

#include <cstdint>

#include "vrx/host/base/descriptor.h"

namespace vrx::host {

class ServerBus {
public:
    enum class Step {
        Progress,  // there may be more to do at once
        Idle,      // nothing more until the socket is ready
        Ended,     // the client has gone, or was cut off
    };

    // Only messages from that process are accepted.
    ServerBus(Descriptor socket, pid_t peer);
    ~ServerBus();
    ServerBus(const ServerBus&) = delete;
    ServerBus& operator=(const ServerBus&) = delete;

    // Takes one step: a part of the authentication, or one message. Repeat it until it returns Idle before each wait: a
    // message can arrive together with the end of the authentication and wait in sd-bus's own buffer.
    Step step();

    bool isAuthenticated() const;
    std::size_t unsentMessages() const;

    // For a poll(): what to wait for on the socket.
    int socket() const { return socket_; }
    short events() const;

    sd_bus* bus() const { return bus_; }

private:
    enum class Incoming { Nothing, Admitted, Refused, End };
    Incoming examineIncoming() const;
    bool hasQueued() const;

    sd_bus* bus_ = nullptr;
    int socket_;
    const pid_t peer_;
    int state_ = 0;           // a negative errno once the connection is over
    bool isDrained_ = false;  // sd-bus's buffer is empty after authentication
};

}  // namespace vrx::host
