// A bare sd-bus server: one thread a connection, which sends the same reply to each call, byte for byte that of an
// agent's cached lookup. The reply comes from a file, so that the server asks no agent.
//
//     echo_server --save AGENT_SOCKET FILE    keeps the agent's reply, as a property list
//     echo_server FILE SOCKET                 serves
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <fstream>
#include <iterator>
#include <thread>

#include "peer.h"
#include "vrx/codec/property_list.h"
#include "vrx/wire/encoding.h"

namespace {

using vrx::bench::check;
using vrx::platform::Data;
using vrx::platform::Value;

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

// Can be read only once it is sealed. Null on a bus whose client has gone.
sd_bus_message* payloadOf(sd_bus* bus, const Value& root) {
    sd_bus_message* payload = nullptr;
    if (sd_bus_message_new_signal(bus, &payload, vrx::wire::objectPath, vrx::wire::interfaceName, "Payload") < 0)
        return nullptr;
    check(vrx::wire::appendReply(payload, root), "payload");
    check(sd_bus_message_seal(payload, 1, 0), "payload");
    return payload;
}

void serve(int file, const Value& root) {
    sd_bus* bus = nullptr;
    sd_id128_t id;
    check(sd_id128_randomize(&id), "id");
    check(sd_bus_new(&bus), "bus");
    check(sd_bus_set_fd(bus, file, file), "bus");
    check(sd_bus_set_server(bus, 1, id), "bus");
    check(sd_bus_set_anonymous(bus, 1), "bus");
    sd_bus_start(bus);
    if (sd_bus_message* payload = payloadOf(bus, root)) {
        check(sd_bus_add_filter(bus, nullptr, answer, payload), "filter");
        int result = 0;
        while ((result = sd_bus_process(bus, nullptr)) >= 0)
            if (result == 0 && sd_bus_wait(bus, UINT64_MAX) < 0) break;
        sd_bus_message_unref(payload);
    }
    sd_bus_flush_close_unref(bus);
}

int save(const char* agentSocket, const char* path) {
    sd_bus* agent = vrx::bench::connectTo(agentSocket);
    const auto root = vrx::wire::readReply(vrx::bench::lookUp(agent));
    const auto bytes =
        vrx::codec::serializePropertyList(root ? *root : Value(), vrx::platform::PropertyListFormat::Binary);
    if (!bytes) check(-EINVAL, "save");
    std::ofstream(path).write(reinterpret_cast<const char*>(bytes->data()),
                              static_cast<std::streamsize>(bytes->size()));
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc == 4 && std::string(argv[1]) == "--save") return save(argv[2], argv[3]);
    if (argc != 3) return 2;
    std::ifstream saved(argv[1]);
    const auto root = vrx::codec::parsePropertyList(Data(std::istreambuf_iterator<char>(saved), {}));
    if (!root) check(-EINVAL, argv[1]);
    const sockaddr_un address = vrx::bench::addressOf(argv[2]);
    unlink(argv[2]);
    const int listener = check(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0), "socket");
    if (bind(listener, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) check(-errno, "bind");
    if (listen(listener, 128) != 0) check(-errno, "listen");
    while (true) {
        const int file = accept4(listener, nullptr, nullptr, SOCK_CLOEXEC);
        if (file < 0) check(-errno, "accept");
        std::thread([file, &root] { serve(file, *root); }).detach();
    }
}
