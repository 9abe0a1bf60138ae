#include "vrx/client/agent_connection.h"

#include "vrx/client/bus_pool.h"
#include "vrx/client/local_platform.h"
#include "vrx/client/workers.h"
#include "vrx/codec/core/keyed_archive.h"
#include "vrx/wire/locations.h"

namespace vrx::client {

using platform::Result;
using platform::Value;
using wire::OperationIndex;

namespace {

Failure badReply(std::string text) {
    return {Failure::Kind::BadReply, std::move(text)};
}

// Decodes each reply as the type that the operation returns and no other.
template <class T>
struct Decoder;

template <>
struct Decoder<bool> {
    static Answer<bool> decode(const Value& root) {
        if (auto flag = root.asBool()) return *flag;
        return badReply("the reply is no boolean");
    }
};

template <>
struct Decoder<std::optional<std::string>> {
    static Answer<std::optional<std::string>> decode(const Value& root) {
        if (root.isNull()) return std::optional<std::string>();
        if (const std::string* text = root.asString()) return std::optional(*text);
        return badReply("the reply is no string");
    }
};

template <>
struct Decoder<Value> {
    static Answer<Value> decode(const Value& root) {
        using enum platform::AllowedKinds::Kind;
        if (root.isNull()) return Value();
        Result<Value> value = codec::unarchiveValue(root, {Dictionaries, Arrays, Strings, Numbers, Dates});
        if (!value) return badReply(value.error().text);
        if (!value->asDictionary()) return badReply("the reply is no dictionary");
        return std::move(value).value();
    }
};

template <class T>
struct Decoder<std::shared_ptr<T>> {
    static Answer<std::shared_ptr<T>> decode(const Value& root) {
        if (root.isNull()) return std::shared_ptr<T>();
        Result<std::shared_ptr<T>> object = codec::unarchive<T>(root);
        if (!object) return badReply(object.error().text);
        return std::move(object).value();
    }
};

template <class T>
struct Decoder<std::vector<std::shared_ptr<T>>> {
    static Answer<std::vector<std::shared_ptr<T>>> decode(const Value& root) {
        Result<std::vector<std::shared_ptr<T>>> objects = codec::unarchiveList<T>(root);
        if (!objects) return badReply(objects.error().text);
        return std::move(objects).value();
    }
};

}  // namespace

class AgentConnection::Implementation {
public:
    Implementation(ConnectionOptions options, FailureHandler failureHandler)
        : timeLimit_(options.timeLimit),
          failureHandler_(std::move(failureHandler)),
          pool_(options.socketPath.empty() ? wire::findAgent().socket.path : std::move(options.socketPath),
                options.connections),
          workers_(options.connections) {
        installPlatformIfNone();
    }
    // The workers can then end without waiting for replies.
    ~Implementation() { pool_.close(); }

    template <class T>
    Answer<T> call(OperationIndex operation, const CallArguments& arguments = {}) {
        Answer<Value> root = pool_.call(wire::operation(operation), arguments, deadline());
        if (!root) return root.failure();
        return Decoder<T>::decode(*root);
    }

    // The text is the operation's string argument, if it has one. The task owns it until the call has ended.
    template <class T>
    void callLater(OperationIndex operation, Reply<T> reply, std::string text = {}, CallArguments arguments = {}) {
        workers_.post([this, operation, reply = std::move(reply), text = std::move(text), arguments]() mutable {
            arguments.text = text;
            Answer<T> answer = call<T>(operation, arguments);
            if (!answer && failureHandler_) failureHandler_(wire::operation(operation).member, answer.failure());
            if (reply) reply(answer ? *answer : T{});
        });
    }

    const std::string& socketPath() const { return pool_.socketPath(); }
    platform::Duration timeLimit() const { return timeLimit_; }

private:
    Deadline deadline() const {
        constexpr platform::Duration century{100.0 * 366 * 86400};
        return std::chrono::steady_clock::now() +
               std::chrono::duration_cast<std::chrono::steady_clock::duration>(std::min(timeLimit_, century));
    }

    const platform::Duration timeLimit_;
    const FailureHandler failureHandler_;
    BusPool pool_;
    Workers workers_;
};

AgentConnection::AgentConnection(ConnectionOptions options, FailureHandler failureHandler)
    : implementation_(std::make_unique<Implementation>(std::move(options), std::move(failureHandler))) {}

AgentConnection::~AgentConnection() = default;

const std::string& AgentConnection::socketPath() const {
    return implementation_->socketPath();
}

platform::Duration AgentConnection::timeLimit() const {
    return implementation_->timeLimit();
}

Answer<bool> AgentConnection::scheduleOutreachWithReply() {
    return implementation_->call<bool>(OperationIndex::ScheduleOutreach);
}

Answer<Value> AgentConnection::checkIsAvailableInStore(const std::string& bundleIdentifier) {
    return implementation_->call<Value>(OperationIndex::CheckIsAvailableInStore, {.text = bundleIdentifier});
}

Answer<Value> AgentConnection::appSupportAvailability(const std::string& bundleIdentifier) {
    return implementation_->call<Value>(OperationIndex::AppSupportAvailability, {.text = bundleIdentifier});
}

Answer<std::optional<std::string>> AgentConnection::readWebURLOverride() {
    return implementation_->call<std::optional<std::string>>(OperationIndex::ReadWebURLOverride);
}

Answer<std::shared_ptr<VRXDevice>> AgentConnection::defaultDevice() {
    return implementation_->call<std::shared_ptr<VRXDevice>>(OperationIndex::DefaultDevice);
}

Answer<DeviceList> AgentConnection::pairedDevices() {
    return implementation_->call<DeviceList>(OperationIndex::PairedDevices);
}

Answer<std::shared_ptr<VRXDeviceInfo>> AgentConnection::getDefaultDeviceInfoUsingPolicy(
    VRXWarrantyLookupPolicy policy) {
    return implementation_->call<std::shared_ptr<VRXDeviceInfo>>(OperationIndex::GetDefaultDeviceInfo,
                                                                 {.policy = policy});
}

Answer<std::shared_ptr<VRXDeviceInfo>> AgentConnection::getDeviceInfoForSerialNumber(const std::string& serialNumber,
                                                                                     VRXWarrantyLookupPolicy policy) {
    return implementation_->call<std::shared_ptr<VRXDeviceInfo>>(OperationIndex::GetDeviceInfoForSerialNumber,
                                                                 {.text = serialNumber, .policy = policy});
}

Answer<DeviceInfoList> AgentConnection::getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy,
                                                                     bool updateFollowUps) {
    return implementation_->call<DeviceInfoList>(OperationIndex::GetAllDeviceInfos,
                                                 {.policy = policy, .flag = updateFollowUps});
}

Answer<bool> AgentConnection::dismissFollowUpForSerialNumber(const std::string& serialNumber) {
    return implementation_->call<bool>(OperationIndex::DismissFollowUpForSerialNumber, {.text = serialNumber});
}

void AgentConnection::scheduleOutreachWithReply(Reply<bool> reply) {
    implementation_->callLater(OperationIndex::ScheduleOutreach, std::move(reply));
}

void AgentConnection::checkIsAvailableInStore(std::string bundleIdentifier, Reply<Value> reply) {
    implementation_->callLater(OperationIndex::CheckIsAvailableInStore, std::move(reply), std::move(bundleIdentifier));
}

void AgentConnection::appSupportAvailability(std::string bundleIdentifier, Reply<Value> reply) {
    implementation_->callLater(OperationIndex::AppSupportAvailability, std::move(reply), std::move(bundleIdentifier));
}

void AgentConnection::readWebURLOverride(Reply<std::optional<std::string>> reply) {
    implementation_->callLater(OperationIndex::ReadWebURLOverride, std::move(reply));
}

void AgentConnection::defaultDevice(Reply<std::shared_ptr<VRXDevice>> reply) {
    implementation_->callLater(OperationIndex::DefaultDevice, std::move(reply));
}

void AgentConnection::pairedDevices(Reply<DeviceList> reply) {
    implementation_->callLater(OperationIndex::PairedDevices, std::move(reply));
}

void AgentConnection::getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicy policy,
                                                      Reply<std::shared_ptr<VRXDeviceInfo>> reply) {
    implementation_->callLater(OperationIndex::GetDefaultDeviceInfo, std::move(reply), {}, {.policy = policy});
}

void AgentConnection::getDeviceInfoForSerialNumber(std::string serialNumber, VRXWarrantyLookupPolicy policy,
                                                   Reply<std::shared_ptr<VRXDeviceInfo>> reply) {
    implementation_->callLater(OperationIndex::GetDeviceInfoForSerialNumber, std::move(reply), std::move(serialNumber),
                               {.policy = policy});
}

void AgentConnection::getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy, bool updateFollowUps,
                                                   Reply<DeviceInfoList> reply) {
    implementation_->callLater(OperationIndex::GetAllDeviceInfos, std::move(reply), {},
                               {.policy = policy, .flag = updateFollowUps});
}

void AgentConnection::dismissFollowUpForSerialNumber(std::string serialNumber, Reply<bool> completion) {
    implementation_->callLater(OperationIndex::DismissFollowUpForSerialNumber, std::move(completion),
                               std::move(serialNumber));
}

}  // namespace vrx::client
