// The connections of one client object. Makes each call on a free connection, or on a new one. Any thread may call.
#pragma once

#include <condition_variable>
#include <list>
#include <memory>
#include <mutex>
#include <string>

#include "vrx/client/agent_bus.h"

namespace vrx::client {

class BusPool {
public:
    BusPool(std::string socketPath, std::size_t connections)
        : socketPath_(std::move(socketPath)), connections_(connections) {}

    // Returns the archived root of the operation's reply. A call whose connection ended before the reply is sent again,
    // once, on a new connection.
    Answer<platform::Value> call(const wire::Operation& operation, const CallArguments& arguments, Deadline deadline);

    // Ends the calls under way; later ones fail.
    void close();

    const std::string& socketPath() const { return socketPath_; }

private:
    using Bus = std::unique_ptr<AgentBus>;
    enum class Age { Any, New };

    CallResult callOnce(const wire::Operation& operation, const CallArguments& arguments, Deadline deadline, Age age);
    std::variant<Bus, Failure> take(Deadline deadline, Age age);
    bool beginUse(AgentBus& bus);
    void endUse(Bus bus, bool isUseful);

    const std::string socketPath_;
    const std::size_t connections_;
    std::mutex mutex_;
    std::condition_variable isFree_;
    std::size_t taken_ = 0;
    std::list<Bus> idle_;
    std::list<const AgentBus*> inUse_;
    bool isClosed_ = false;
};

}  // namespace vrx::client
