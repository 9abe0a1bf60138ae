#include "vrx/client/bus_pool.h"

#include <cerrno>

namespace vrx::client {

using platform::Value;

Answer<Value> BusPool::call(const Request& request, Deadline deadline) {
    CallResult result = callOnce(request, deadline, Age::Any);
    // An idle agent may have ended since the last call; the next agent answers on a new connection.
    if (std::holds_alternative<ConnectionEnded>(result)) result = callOnce(request, deadline, Age::New);
    if (auto* root = std::get_if<Value>(&result)) return std::move(*root);
    if (auto* failure = std::get_if<Failure>(&result)) return std::move(*failure);
    return Failure{Failure::Kind::NotReachable, std::get<ConnectionEnded>(result).text};
}

CallResult BusPool::callOnce(const Request& request, Deadline deadline, Age age) {
    std::variant<Bus, Failure> taken = take(request, deadline, age);
    if (auto* failure = std::get_if<Failure>(&taken)) return std::move(*failure);
    Bus bus = std::get<Bus>(std::move(taken));
    platform::MaybeError error;
    if (!bus) {
        bus = std::make_unique<AgentBus>();
        error = bus->open(socketPath_, deadline);
    }
    CallResult result = ConnectionEnded{};
    if (error)
        result = Failure{error->code == ETIMEDOUT ? Failure::Kind::TimedOut : Failure::Kind::NotReachable, error->text};
    else if (beginUse(request, *bus))
        result = bus->call(request.operation, request.arguments, deadline, request.interface);
    endUse(request, std::move(bus), std::holds_alternative<Value>(result));
    if (std::holds_alternative<Value>(result)) return result;
    std::lock_guard lock(mutex_);
    if (auto failure = whyNot(request)) return *std::move(failure);  // and not what the interruption looks like
    return result;
}

// Takes the right to use a connection, with an idle one if there is one of that age.
std::variant<BusPool::Bus, Failure> BusPool::take(const Request& request, Deadline deadline, Age age) {
    std::unique_lock lock(mutex_);
    const bool mayGoOn = isFree_.wait_until(lock, deadline, [&] { return whyNot(request) || taken_ < connections_; });
    if (!mayGoOn) return Failure{Failure::Kind::TimedOut, "all connections were busy"};
    if (auto failure = whyNot(request)) return *std::move(failure);
    ++taken_;
    if (age == Age::New) idle_.clear();  // they ended with the connection that is to be replaced
    if (idle_.empty()) return Bus();
    Bus bus = std::move(idle_.back());  // the one used last
    idle_.pop_back();
    return bus;
}

// Under the lock.
std::optional<Failure> BusPool::whyNot(const Request& request) const {
    if (isClosed_) return Failure{Failure::Kind::NotReachable, "the connection object is going"};
    if (request.isCancelled) return Failure{Failure::Kind::Cancelled, "the call was cancelled"};
    return std::nullopt;
}

// Lets close() and cancel() interrupt the connection from now on; false when that has been called already.
bool BusPool::beginUse(const Request& request, AgentBus& bus) {
    std::lock_guard lock(mutex_);
    if (whyNot(request)) return false;
    inUse_[&request] = &bus;
    return true;
}

void BusPool::endUse(const Request& request, Bus bus, bool isUseful) {
    {
        std::lock_guard lock(mutex_);
        inUse_.erase(&request);
        --taken_;
        if (isUseful && !whyNot(request)) idle_.push_back(std::move(bus));
    }
    isFree_.notify_one();
}

void BusPool::cancel(Request& request) {
    std::lock_guard lock(mutex_);
    request.isCancelled = true;
    if (const auto use = inUse_.find(&request); use != inUse_.end()) use->second->interrupt();
    isFree_.notify_all();
}

void BusPool::close() {
    std::lock_guard lock(mutex_);
    isClosed_ = true;
    for (const auto& [request, bus] : inUse_) bus->interrupt();
    isFree_.notify_all();
}

}  // namespace vrx::client
