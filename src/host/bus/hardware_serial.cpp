#include "vrx/host/bus/hardware_serial.h"

#include <cstring>
#include <utility>

#include "vrx/host/base/firmware_text.h"

namespace vrx::host {

HardwareSerial::HardwareSerial(SystemBus& bus, std::function<void()> onChange)
    : BusService(bus, "org.freedesktop.hostname1", Activation::ByQuestion), onChange_(std::move(onChange)) {}

void HardwareSerial::startAsking() {
    isWanted_ = true;
    if (mayAsk_) ask();
}

HardwareSerial::State HardwareSerial::state() const {
    const std::lock_guard lock(mutex_);
    return state_;
}

std::optional<std::string> HardwareSerial::value() const {
    const std::lock_guard lock(mutex_);
    return state_ == State::Known ? std::optional(serial_) : std::nullopt;
}

void HardwareSerial::follow() {
    mayAsk_ = isAnswered_ = false;
}

// The service leaves when it has nothing to do, and each question would start it again.
void HardwareSerial::ask() {
    mayAsk_ = true;
    if (!isWanted_ || isAnswered_ || state() == State::Known) return;
    call("/org/freedesktop/hostname1", "org.freedesktop.hostname1", "GetHardwareSerial",
         [this](sd_bus_message* reply) { take(reply); });
}

// With a question open it has gone without an answer.
void HardwareSerial::left() {
    if (isWanted_ && !isSettled()) settle(std::nullopt);
}

void HardwareSerial::take(sd_bus_message* reply) {
    constexpr std::size_t longest = 256;
    isAnswered_ = isThere();  // else the error is the bus's, and the service is asked when it comes
    const char* text = nullptr;
    if (!reply || sd_bus_message_has_signature(reply, "s") <= 0 || sd_bus_message_read_basic(reply, 's', &text) <= 0 ||
        std::strlen(text) > longest)
        return settle(std::nullopt);
    settle(meaningfulFirmwareText(text));
}

void HardwareSerial::settle(std::optional<std::string> serial) {
    {
        const std::lock_guard lock(mutex_);
        const State state = serial ? State::Known : State::Absent;
        if (std::exchange(state_, state) == state) return;
        serial_ = std::move(serial).value_or("");
    }
    onChange_();
}

std::optional<std::string> askHardwareSerial(const std::string& address, std::chrono::milliseconds limit) {
    const EventLoop loop = makeEventLoop();
    SystemBus bus(loop.get(), address);
    if (!bus.hasSocket()) return std::nullopt;
    HardwareSerial serial(bus, [] {});
    serial.startAsking();
    bus.start();
    bus.runUntil([&] { return serial.isSettled(); }, limit);
    return serial.value();
}

}  // namespace vrx::host
