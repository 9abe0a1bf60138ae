// What comes over the agent's socket, from either side. The first byte chooses: a reply's body, read by a client, which
// must not crash and must come out the same when what was understood is sent again; the bytes that an authenticated
// client writes, which the agent's session must survive; or the body of a well-formed request, whose operation the
// second byte chooses, and of which the agent must not understand anything but what a client would write.
#include <sys/socket.h>
#include <systemd/sd-bus.h>

#include <atomic>
#include <bit>
#include <functional>
#include <string>

#include "client/fake_agent.h"
#include "client/fake_host.h"
#include "client/raw_client.h"
#include "require.h"
#include "vrx/codec/core/keyed_archive.h"
#include "vrx/host/ipc/client_session.h"
#include "vrx/host/log/system_log.h"
#include "vrx/host/loop/main_loop.h"
#include "vrx/host/loop/process_lifecycle.h"
#include "vrx/platform/platform.h"
#include "vrx/wire/encoding.h"

using namespace vrx;

namespace {

// Two authenticated ends of a bus in one thread. Bytes that are written past the one end arrive at the other.
class BusPair {
public:
    BusPair() {
        int ends[2];
        require(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, ends) == 0);
        raw_ = ends[0];
        sd_id128_t identifier{};
        require(sd_bus_new(&server_) >= 0 && sd_bus_set_fd(server_, ends[0], ends[0]) >= 0 &&
                sd_bus_set_server(server_, 1, identifier) >= 0 && sd_bus_start(server_) >= 0);
        require(sd_bus_new(&client_) >= 0 && sd_bus_set_fd(client_, ends[1], ends[1]) >= 0 &&
                sd_bus_add_filter(client_, nullptr, onMessage, this) >= 0 && sd_bus_start(client_) >= 0);
        while (sd_bus_is_ready(server_) == 0 || sd_bus_is_ready(client_) == 0)
            require(sd_bus_process(server_, nullptr) >= 0 && sd_bus_process(client_, nullptr) >= 0);
    }
    ~BusPair() {
        sd_bus_close_unref(client_);
        sd_bus_close_unref(server_);
    }

    // Hands over a signal with that body, unless the bus finds it bad.
    void readBody(const char* signature, const std::string& body, std::function<void(sd_bus_message*)> reader) {
        const std::string message = test::RawClient::message(
            '\x04', 1, {{1, 'o', "/a"}, {2, 's', "a.b"}, {3, 's', "c"}, {8, 'g', signature}}, body);
        require(write(raw_, message.data(), message.size()) == static_cast<ssize_t>(message.size()));
        reader_ = std::move(reader);
        for (int r = 1; r > 0 && reader_;) r = sd_bus_process(client_, nullptr);
    }

    bool isOpen() const { return sd_bus_is_open(client_) > 0; }
    sd_bus* bus() const { return client_; }

private:
    static int onMessage(sd_bus_message* message, void* self, sd_bus_error*) {
        std::exchange(static_cast<BusPair*>(self)->reader_, nullptr)(message);
        return 1;
    }

    sd_bus* server_ = nullptr;
    sd_bus* client_ = nullptr;
    int raw_;
    std::function<void(sd_bus_message*)> reader_;
};

// The bus closes a connection when it finds a message bad.
BusPair& openPair() {
    static std::unique_ptr<BusPair> pair;
    if (!pair || !pair->isOpen()) pair = std::make_unique<BusPair>();
    return *pair;
}

void fuzzReply(const std::string& body) {
    BusPair& pair = openPair();
    platform::Result<platform::Value> reply = platform::Error{"bus", 0, "no message"};
    pair.readBody(wire::replySignature, body, [&](sd_bus_message* message) { reply = wire::readReply(message); });
    if (!reply) return;
    codec::unarchive<VRXDeviceInfo>(*reply);
    codec::unarchiveList<VRXDevice>(*reply);

    sd_bus_message* again = nullptr;
    require(sd_bus_message_new_signal(pair.bus(), &again, "/a", "a.b", "c") >= 0);
    require(wire::appendReply(again, *reply) >= 0 && sd_bus_message_seal(again, 1, 0) >= 0);
    auto second = wire::readReply(again);
    // What is not a number equals nothing; texts do.
    require(second && second->description() == reply->description());
    sd_bus_message_unref(again);
}

// Echoes what it is asked for, and answers at once.
struct Agent final : test::FakeAgent {
    Agent() {
        onStore = [](std::string id, Reply<platform::Value> reply) { reply(platform::Dictionary{{id, 1}}); };
        onDeviceInfo = [](std::string serialNumber, Reply<std::shared_ptr<VRXDeviceInfo>> reply) {
            auto device = VRXDevice::deviceWithName(serialNumber, serialNumber, std::nullopt, VRXDeviceTypeOther);
            reply(VRXDeviceInfo::deviceInfoWithDevice(device, nullptr));
        };
    }
    void appSupportAvailability(std::string id, Reply<platform::Value> reply) override { reply(id); }
    void getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy, bool, Reply<DeviceInfoList> reply) override {
        reply({});
    }
};

void fuzzRequests(const std::string& bytes) {
    static host::SystemLog log(platform::Level::Error);
    static platform::Platform platform({.systemLog = &log});
    platform::ScopedPlatform current(platform);
    int ends[2];
    require(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, ends) == 0);
    const host::Descriptor client(ends[1]);
    host::Descriptor agentEnd(ends[0]);
    auto peer = host::PeerIdentity::ofPeer(ends[0]);
    require(static_cast<bool>(peer));
    host::ServiceLimits limits;
    static host::MainLoop mainLoop;
    host::ProcessLifecycle lifecycle(mainLoop);
    host::RequestLine line(limits);
    test::FakeHost fakeHost;
    host::ClientSession session(std::move(agentEnd), *peer, std::make_shared<Agent>(),
                                std::make_shared<host::ReplyBox>(), {limits, line, lifecycle, &fakeHost});
    const std::string sent = test::RawClient::authentication() + bytes;
    [[maybe_unused]] ssize_t size = write(ends[1], sent.data(), sent.size());
    shutdown(ends[1], SHUT_WR);
    host::SessionState state;
    session.serve(state);
}

// As a client writes them.
std::string bodyOf(const wire::Operation& operation, const host::RequestArguments& arguments) {
    std::string body;
    auto add = [&body](std::uint64_t number, std::size_t size) {
        body.resize((body.size() + size - 1) / size * size);
        body.append(reinterpret_cast<const char*>(&number), size);
    };
    for (const char type : std::string_view(operation.signature)) {
        if (type == 's') {
            add(arguments.text.size(), 4);
            body += arguments.text + '\0';
        } else if (type == 't') {
            add(arguments.policy, 8);
        } else {
            add(arguments.flag, 4);
        }
    }
    return body;
}

void fuzzArguments(std::size_t choice, const std::string& body) {
    constexpr std::array interfaces{&wire::agentInterface, &wire::hostInterface, &wire::followUpsInterface,
                                    &wire::coverageInterface};
    const wire::Interface& interface = *interfaces[choice % interfaces.size()];
    const wire::Operation& operation = interface.operations[choice / interfaces.size() % interface.operations.size()];
    openPair().readBody(operation.signature, body, [&](sd_bus_message* message) {
        const auto arguments = host::readArguments(message, body, std::endian::little, operation);
        require(!arguments || bodyOf(operation, *arguments) == body);
    });
    fuzzRequests(test::RawClient::call(operation.member, 1, operation.signature, body, interface));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    if (size == 0 || size > 60'000) return 0;
    const std::string bytes(reinterpret_cast<const char*>(data) + 1, size - 1);
    switch (data[0] % 3) {
        case 0: fuzzReply(bytes); break;
        case 1: fuzzRequests(bytes); break;
        default:
            if (size > 1) fuzzArguments(data[1], bytes.substr(1));
    }
    return 0;
}
