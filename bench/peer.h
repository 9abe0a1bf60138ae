// A peer-to-peer connection of sd-bus to a socket, for the measuring programs; whatever fails ends the program.
#pragma once

#include <sys/socket.h>
#include <sys/un.h>
#include <systemd/sd-bus.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "vrx/wire/names.h"

namespace vrx::bench {

inline int check(int result, const char* what) {
    if (result >= 0) return result;
    std::fprintf(stderr, "%s: %s\n", what, std::strerror(-result));
    std::exit(1);
}

inline sockaddr_un addressOf(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, path.c_str(), sizeof address.sun_path - 1);
    return address;
}

inline sd_bus* connectTo(const std::string& path) {
    const sockaddr_un address = addressOf(path);
    const int file = check(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0), "socket");
    if (connect(file, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) check(-errno, "connect");
    sd_bus* bus = nullptr;
    check(sd_bus_new(&bus), "bus");
    check(sd_bus_set_fd(bus, file, file), "bus");
    check(sd_bus_start(bus), "bus");
    return bus;
}

constexpr std::uint64_t cachedOnly = 1;

// The reply to a lookup of this device's cached record. The caller unreferences it.
inline sd_bus_message* lookUp(sd_bus* bus) {
    sd_bus_message* reply = nullptr;
    check(sd_bus_call_method(bus, wire::serviceName, wire::objectPath, wire::interfaceName,
                             wire::operation(wire::OperationIndex::GetDefaultDeviceInfo).member, nullptr, &reply, "t",
                             cachedOnly),
          "call");
    return reply;
}

// So, of the cached records of all devices.
inline sd_bus_message* lookUpAll(sd_bus* bus) {
    sd_bus_message* reply = nullptr;
    check(sd_bus_call_method(bus, wire::serviceName, wire::objectPath, wire::interfaceName,
                             wire::operation(wire::OperationIndex::GetAllDeviceInfos).member, nullptr, &reply, "tb",
                             cachedOnly, 0),
          "call");
    return reply;
}

// So, of the follow-ups that are shown.
inline sd_bus_message* askForFollowUps(sd_bus* bus) {
    sd_bus_message* reply = nullptr;
    check(sd_bus_call_method(bus, wire::serviceName, wire::followUpsInterface.path, wire::followUpsInterface.name,
                             wire::pendingFollowUpsOperation.member, nullptr, &reply, nullptr),
          "call");
    return reply;
}

}  // namespace vrx::bench
