// Event sources of the main loop, each removed when its owner is destroyed.
#pragma once

#include <systemd/sd-event.h>

#include <cstdint>
#include <ctime>
#include <memory>
#include <system_error>

#include "vrx/platform/date.h"

namespace vrx::host {

struct EventSourceRelease {
    void operator()(sd_event_source* source) const { sd_event_source_disable_unref(source); }
};
using EventSource = std::unique_ptr<sd_event_source, EventSourceRelease>;

struct EventLoopRelease {
    void operator()(sd_event* loop) const { sd_event_unref(loop); }
};
using EventLoop = std::unique_ptr<sd_event, EventLoopRelease>;

inline void checkEventCall(int result, const char* what) {
    if (result < 0) throw std::system_error(-result, std::generic_category(), what);
}

inline EventLoop makeEventLoop() {
    sd_event* loop = nullptr;
    checkEventCall(sd_event_new(&loop), "event loop");
    return EventLoop(loop);
}

// Calls whenever there is something to read.
inline EventSource addReadSource(sd_event* loop, int file, sd_event_io_handler_t handler, void* userdata) {
    sd_event_source* source = nullptr;
    checkEventCall(sd_event_add_io(loop, &source, file, EPOLLIN, handler, userdata), "event source");
    return EventSource(source);
}

// Calls at the signal, which must be blocked.
inline EventSource addSignalSource(sd_event* loop, int signal, sd_event_signal_handler_t handler, void* userdata) {
    sd_event_source* source = nullptr;
    checkEventCall(sd_event_add_signal(loop, &source, signal, handler, userdata), "signal");
    return EventSource(source);
}

// A timer on the boot clock, accurate to a millisecond and never early; not armed yet.
inline EventSource addBootTimer(sd_event* loop, sd_event_time_handler_t handler, void* userdata) {
    constexpr std::uint64_t accuracy = 1000;
    sd_event_source* source = nullptr;
    checkEventCall(sd_event_add_time(loop, &source, CLOCK_BOOTTIME, 0, accuracy, handler, userdata), "timer");
    EventSource owner(source);
    checkEventCall(sd_event_source_set_enabled(source, SD_EVENT_OFF), "timer");
    return owner;
}

// Fires once, at a time since boot; after some 300 years at the latest.
inline void armTimer(const EventSource& timer, platform::Duration sinceBoot) {
    constexpr platform::Duration longest{1e10};
    const auto microseconds = std::chrono::ceil<std::chrono::microseconds>(std::min(sinceBoot, longest));
    checkEventCall(sd_event_source_set_time(timer.get(), static_cast<std::uint64_t>(microseconds.count())), "timer");
    checkEventCall(sd_event_source_set_enabled(timer.get(), SD_EVENT_ONESHOT), "timer");
}

inline void disarmTimer(const EventSource& timer) {
    checkEventCall(sd_event_source_set_enabled(timer.get(), SD_EVENT_OFF), "timer");
}

inline platform::Duration bootTime() {
    timespec now{};
    clock_gettime(CLOCK_BOOTTIME, &now);
    return std::chrono::seconds(now.tv_sec) + std::chrono::nanoseconds(now.tv_nsec);
}

}  // namespace vrx::host
