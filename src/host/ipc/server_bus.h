// The agent's end of one client's socket, in D-Bus's protocol: takes the client through authentication and hands out
// its messages. It answers Hello, with which stock tools begin although there is no bus daemon. Made on any thread and
// then used by one.
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

    // Messages are admitted from that process only.
    ServerBus(Descriptor socket, pid_t peer);
    ~ServerBus();
    ServerBus(const ServerBus&) = delete;
    ServerBus& operator=(const ServerBus&) = delete;

    // Takes one step: a part of the authentication, or one message. To be called until it is idle before each wait,
    // because a message may have come together with the end of the authentication and wait in sd-bus's own buffer.
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
    bool isDrained_ = false;  // sd-bus has handed out what came together with the end of the authentication
};

}  // namespace vrx::host
