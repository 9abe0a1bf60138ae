// What comes over the agent's socket, from either side. The first byte chooses: a reply's body, read by a client, which
// must not crash and must come out the same when what was understood is sent again; or the bytes that an authenticated
// client writes, which the agent's session must survive.
#include <sys/socket.h>
#include <systemd/sd-bus.h>

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <string>

#include "vrx/codec/core/keyed_archive.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/host/ipc/client_session.h"
#include "vrx/host/log/system_log.h"
#include "vrx/host/loop/main_loop.h"
#include "vrx/host/loop/process_lifecycle.h"
#include "vrx/platform/platform.h"
#include "vrx/wire/encoding.h"

using namespace vrx;

namespace {

void require(bool holds) {
    if (!holds) std::abort();
}

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

    platform::Result<platform::Value> readBody(std::string body) {
        // A signal whose signature is that of replies.
        std::string message("l\x04\x01\x01\0\0\0\0\x01\0\0\0\0\0\0\0", 16);
        auto addField = [&](char code, char type, const std::string& value) {
            message.resize((message.size() + 7) / 8 * 8);
            message += {code, '\x01', type, '\0'};
            if (type == 'g')
                message += static_cast<char>(value.size());
            else
                message += {static_cast<char>(value.size()), '\0', '\0', '\0'};
            message += value + '\0';
        };
        addField(1, 'o', "/a");
        addField(2, 's', "a.b");
        addField(3, 's', "c");
        addField(8, 'g', "a{sv}");
        auto fieldBytes = static_cast<std::uint32_t>(message.size() - 16);
        auto bodyBytes = static_cast<std::uint32_t>(body.size());
        std::memcpy(message.data() + 4, &bodyBytes, 4);
        std::memcpy(message.data() + 12, &fieldBytes, 4);
        message.resize((message.size() + 7) / 8 * 8);
        message += body;
        require(write(raw_, message.data(), message.size()) == static_cast<ssize_t>(message.size()));
        result_.reset();
        int r = 1;
        while (r > 0 && !result_) r = sd_bus_process(client_, nullptr);
        return result_ ? *result_ : platform::Error{"bus", r, "no message"};
    }

    bool isOpen() const { return sd_bus_is_open(client_) > 0; }
    sd_bus* bus() const { return client_; }

private:
    static int onMessage(sd_bus_message* message, void* self, sd_bus_error*) {
        static_cast<BusPair*>(self)->result_ = wire::readReply(message);
        return 1;
    }

    sd_bus* server_ = nullptr;
    sd_bus* client_ = nullptr;
    int raw_;
    std::optional<platform::Result<platform::Value>> result_;
};

void fuzzReply(const std::string& body) {
    static std::unique_ptr<BusPair> pair;
    if (!pair || !pair->isOpen()) pair = std::make_unique<BusPair>();
    auto reply = pair->readBody(body);
    if (!reply) return;
    codec::unarchive<VRXDeviceInfo>(*reply);
    codec::unarchiveList<VRXDevice>(*reply);

    sd_bus_message* again = nullptr;
    require(sd_bus_message_new_signal(pair->bus(), &again, "/a", "a.b", "c") >= 0);
    require(wire::appendReply(again, *reply) >= 0 && sd_bus_message_seal(again, 1, 0) >= 0);
    auto second = wire::readReply(again);
    // What is not a number equals nothing; texts do.
    require(second && second->description() == reply->description());
    sd_bus_message_unref(again);
}

class Agent final : public VRXAgentProtocol {
    void scheduleOutreachWithReply(Reply<bool> reply) override { reply(true); }
    void checkIsAvailableInStore(std::string id, Reply<platform::Value> reply) override {
        reply(platform::Dictionary{{id, 1}});
    }
    void appSupportAvailability(std::string id, Reply<platform::Value> reply) override { reply(id); }
    void readWebURLOverride(Reply<std::optional<std::string>> reply) override { reply("u"); }
    void defaultDevice(Reply<std::shared_ptr<VRXDevice>> reply) override { reply(nullptr); }
    void pairedDevices(Reply<DeviceList> reply) override { reply({}); }
    void getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicy,
                                         Reply<std::shared_ptr<VRXDeviceInfo>> reply) override {
        reply(nullptr);
    }
    void getDeviceInfoForSerialNumber(std::string serialNumber, VRXWarrantyLookupPolicy,
                                      Reply<std::shared_ptr<VRXDeviceInfo>> reply) override {
        auto device = VRXDevice::deviceWithName(serialNumber, serialNumber, std::nullopt, VRXDeviceTypeOther);
        reply(VRXDeviceInfo::deviceInfoWithDevice(device, nullptr));
    }
    void getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy, bool, Reply<DeviceInfoList> reply) override {
        reply({});
    }
    void dismissFollowUpForSerialNumber(std::string, Reply<bool> reply) override { reply(true); }
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
    host::ClientSession session(std::move(agentEnd), *peer, std::make_shared<Agent>(),
                                std::make_shared<host::ReplyBox>(), limits, lifecycle);
    std::string hex;
    for (char digit : std::to_string(getuid())) hex += std::string("3") + digit;
    const std::string sent = std::string(1, '\0') + "AUTH EXTERNAL " + hex + "\r\nBEGIN\r\n" + bytes;
    [[maybe_unused]] ssize_t size = write(ends[1], sent.data(), sent.size());
    shutdown(ends[1], SHUT_WR);
    session.serve(std::atomic<bool>(false));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    if (size == 0 || size > 60'000) return 0;
    const std::string bytes(reinterpret_cast<const char*>(data) + 1, size - 1);
    if (data[0] % 2 == 0)
        fuzzReply(bytes);
    else
        fuzzRequests(bytes);
    return 0;
}
