// A bare sd-bus server: one thread a connection, which sends the same reply to each call, byte for byte that of an
// agent's cached lookup.
//
//     echo_server AGENT_SOCKET SOCKET
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <thread>

#include "peer.h"

namespace {

using vrx::bench::check;

int answer(sd_bus_message* call, void* payload, sd_bus_error*) {
    // Each thread reads a copy of its own: a message keeps the place at which it is read.
    auto* body = static_cast<sd_bus_message*>(payload);
    if (!sd_bus_message_is_method_call(call, vrx::wire::interfaceName, nullptr)) return 0;
    sd_bus_message* reply = nullptr;
    check(sd_bus_message_new_method_return(call, &reply), "reply");
    check(sd_bus_message_rewind(body, 1), "rewind");
    check(sd_bus_message_copy(reply, body, 1), "copy");
    check(sd_bus_send(nullptr, reply, nullptr), "send");
    sd_bus_message_unref(reply);
    return 1;
}

void serve(int file, const std::string& agentSocket) {
    sd_bus* agent = vrx::bench::connectTo(agentSocket);
    sd_bus_message* payload = vrx::bench::lookUp(agent);
    sd_bus* bus = nullptr;
    sd_id128_t id;
    check(sd_id128_randomize(&id), "id");
    check(sd_bus_new(&bus), "bus");
    check(sd_bus_set_fd(bus, file, file), "bus");
    check(sd_bus_set_server(bus, 1, id), "bus");
    check(sd_bus_set_anonymous(bus, 1), "bus");
    check(sd_bus_add_filter(bus, nullptr, answer, payload), "filter");
    check(sd_bus_start(bus), "bus");
    int result = 0;
    while ((result = sd_bus_process(bus, nullptr)) >= 0)
        if (result == 0 && sd_bus_wait(bus, UINT64_MAX) < 0) break;
    sd_bus_flush_close_unref(bus);
    sd_bus_message_unref(payload);
    sd_bus_flush_close_unref(agent);
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 3) return 2;
    const std::string agentSocket = argv[1];
    const sockaddr_un address = vrx::bench::addressOf(argv[2]);
    const int listener = check(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0), "socket");
    if (bind(listener, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) check(-errno, "bind");
    if (listen(listener, 128) != 0) check(-errno, "listen");
    std::puts("ready");
    std::fflush(stdout);
    while (true) {
        const int file = accept4(listener, nullptr, nullptr, SOCK_CLOEXEC);
        if (file < 0) check(-errno, "accept");
        std::thread(serve, file, agentSocket).detach();
    }
}
