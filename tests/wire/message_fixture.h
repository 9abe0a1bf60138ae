// Messages to write and then read, without anybody at the other end.
#pragma once

#include <sys/socket.h>
#include <systemd/sd-bus.h>
#include <unistd.h>

#include <stdexcept>

#include "vrx/wire/message.h"

namespace vrx::test {

using Message = wire::MessagePointer;

// A bus that has begun to authenticate itself at a socket at which nobody answers: enough to make messages with.
class Bus {
public:
    Bus() {
        int ends[2];
        if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0 || sd_bus_new(&bus_) < 0 ||
            sd_bus_set_fd(bus_, ends[0], ends[0]) < 0 || sd_bus_start(bus_) < 0)
            throw std::runtime_error("no bus");
        other_ = ends[1];
    }
    ~Bus() {
        sd_bus_close_unref(bus_);
        ::close(other_);
    }
    Bus(const Bus&) = delete;
    Bus& operator=(const Bus&) = delete;

    Message message() {
        sd_bus_message* message = nullptr;
        if (sd_bus_message_new_signal(bus_, &message, "/", "test.Test", "Test") < 0)
            throw std::runtime_error("no message");
        return Message(message);
    }

    // Ready to be read.
    static void seal(const Message& message) {
        if (sd_bus_message_seal(message.get(), 1, 0) < 0 || sd_bus_message_rewind(message.get(), 1) < 0)
            throw std::runtime_error("cannot be sealed");
    }

private:
    sd_bus* bus_ = nullptr;
    int other_ = -1;
};

}  // namespace vrx::test
