// The connections of one client object. Makes each call on a free connection, or on a new one. Any thread may call.
#pragma once

#include <condition_variable>
#include <list>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

#include "vrx/client/agent_bus.h"

namespace vrx::client {

// One call, from its request to its answer.
struct Request {
    const wire::Interface& interface;
    const wire::Operation& operation;
    CallArguments arguments{};
    bool isCancelled = false;  // the pool's
};

class BusPool {
public:
    BusPool(std::string socketPath, std::size_t connections)
        : socketPath_(std::move(socketPath)), connections_(connections) {}

    // Returns the archived root of the operation's reply. A call whose connection ended before the reply is sent again,
    // once, on a new connection.
    Answer<platform::Value> call(const Request& request, Deadline deadline);

    // Ends the request's call, or keeps it from beginning.
    void cancel(Request& request);

    // Ends the calls under way; later ones fail.
    void close();

    const std::string& socketPath() const { return socketPath_; }

private:
    using Bus = std::unique_ptr<AgentBus>;
    enum class Age { Any, New };

    CallResult callOnce(const Request& request, Deadline deadline, Age age);
    std::variant<Bus, Failure> take(const Request& request, Deadline deadline, Age age);
    std::optional<Failure> whyNot(const Request& request) const;
    bool beginUse(const Request& request, AgentBus& bus);
    void endUse(const Request& request, Bus bus, bool isUseful);

    const std::string socketPath_;
    const std::size_t connections_;
    std::mutex mutex_;
    std::condition_variable isFree_;
    std::size_t taken_ = 0;
    std::list<Bus> idle_;
    std::map<const Request*, const AgentBus*> inUse_;
    bool isClosed_ = false;
};

}  // namespace vrx::client
