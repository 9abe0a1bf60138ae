#include "vrx/client/bus_pool.h"

#include <cerrno>

namespace vrx::client {

using platform::Value;

namespace {

Failure closed() {
    return {Failure::Kind::NotReachable, "the connection object is going"};
}

}  // namespace

Answer<Value> BusPool::call(const wire::Operation& operation, const CallArguments& arguments, Deadline deadline) {
    CallResult result = callOnce(operation, arguments, deadline, Age::Any);
    // An idle agent may have ended since the last call; the next agent answers on a new connection.
    if (std::holds_alternative<ConnectionEnded>(result)) result = callOnce(operation, arguments, deadline, Age::New);
    if (auto* root = std::get_if<Value>(&result)) return std::move(*root);
    if (auto* failure = std::get_if<Failure>(&result)) return std::move(*failure);
    return Failure{Failure::Kind::NotReachable, std::get<ConnectionEnded>(result).text};
}

CallResult BusPool::callOnce(const wire::Operation& operation, const CallArguments& arguments, Deadline deadline,
                             Age age) {
    std::variant<Bus, Failure> taken = take(deadline, age);
    if (auto* failure = std::get_if<Failure>(&taken)) return std::move(*failure);
    Bus bus = std::get<Bus>(std::move(taken));
    CallResult result = closed();
    if (bus) {
        if (beginUse(*bus)) result = bus->call(operation, arguments, deadline);
    } else {
        bus = std::make_unique<AgentBus>();
        if (platform::MaybeError error = bus->open(socketPath_, deadline))
            result =
                Failure{error->code == ETIMEDOUT ? Failure::Kind::TimedOut : Failure::Kind::NotReachable, error->text};
        else if (beginUse(*bus))
            result = bus->call(operation, arguments, deadline);
    }
    endUse(std::move(bus), std::holds_alternative<Value>(result));
    return result;
}

// Takes the right to use a connection, with an idle one if there is one of that age.
std::variant<BusPool::Bus, Failure> BusPool::take(Deadline deadline, Age age) {
    std::unique_lock lock(mutex_);
    if (!isFree_.wait_until(lock, deadline, [&] { return isClosed_ || taken_ < connections_; }))
        return Failure{Failure::Kind::TimedOut, "all connections were busy"};
    if (isClosed_) return closed();
    ++taken_;
    if (age == Age::New) idle_.clear();  // they ended with the connection that is to be replaced
    if (idle_.empty()) return Bus();
    Bus bus = std::move(idle_.back());  // the one used last
    idle_.pop_back();
    return bus;
}

// Lets close() interrupt the connection from now on; false when close() has been called already.
bool BusPool::beginUse(AgentBus& bus) {
    std::lock_guard lock(mutex_);
    if (isClosed_) return false;
    inUse_.push_back(&bus);
    return true;
}

void BusPool::endUse(Bus bus, bool isUseful) {
    {
        std::lock_guard lock(mutex_);
        inUse_.remove(bus.get());
        --taken_;
        if (isUseful && !isClosed_) idle_.push_back(std::move(bus));
    }
    isFree_.notify_one();
}

void BusPool::close() {
    std::lock_guard lock(mutex_);
    isClosed_ = true;
    for (const AgentBus* bus : inUse_) bus->interrupt();
    isFree_.notify_all();
}

}  // namespace vrx::client
