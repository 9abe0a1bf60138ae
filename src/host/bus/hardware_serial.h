// The serial number of the machine's hardware as the host name service (org.freedesktop.hostname1) tells it to whom the
// machine's rules permit: the kernel keeps it from all but root. Owned by the host; main thread, but for what says
// otherwise.
#pragma once

#include <chrono>
#include <functional>
#include <mutex>
#include <optional>
#include <string>

#include "vrx/host/bus/bus_service.h"

namespace vrx::host {

class HardwareSerial final : public BusService {
public:
    enum class State : std::uint8_t { Unknown, Absent, Known };

    // Calls onChange, on the main thread, when the state changes.
    HardwareSerial(SystemBus& bus, std::function<void()> onChange);

    // Asks now, or as soon as there is a connection. Nothing is asked before: the question starts the service, so it is
    // only for those who have no serial number from elsewhere. Once a connection, until there is a number.
    void startAsking();

    // The state stays unknown for as long as the bus does not answer, or is not there: whoever waits for it must limit
    // the wait. Absent is refused, unreadable, meaningless or nobody there to ask. Any thread.
    State state() const;
    bool isSettled() const { return state() != State::Unknown; }
    // Any thread. Nothing unless it is known; then it stays.
    std::optional<std::string> value() const;

private:
    void follow() override;
    void ask() override;
    void left() override;
    void take(sd_bus_message* reply);
    void settle(std::optional<std::string> serial);

    const std::function<void()> onChange_;
    bool isWanted_ = false;
    bool mayAsk_ = false;      // on this connection
    bool isAnswered_ = false;  // on this connection, by the service
    mutable std::mutex mutex_;
    State state_ = State::Unknown;
    std::string serial_;
};

// Asks on a loop of its own and waits for the answer: until the time is over, or the process is told to end. Nothing
// when there is no bus. For the start of the process; the address is as for SystemBus.
std::optional<std::string> askHardwareSerial(const std::string& address, std::chrono::milliseconds limit);

}  // namespace vrx::host
