// The log, kept for tests to read.
#pragma once

#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/platform/log.h"

namespace vrx::sim {

class SystemLog final : public platform::SystemLog {
public:
    bool isOn(platform::Level level) const override { return level >= lowest; }
    void write(const platform::LogEntry& entry) override {
        entries_.push_back(entry);
        if (listener) listener(entry);
    }

    // Entries below this level are not even composed.
    platform::Level lowest = platform::Level::Debug;

    std::function<void(const platform::LogEntry& entry)> listener;  // hears each line when it is written

    const std::vector<platform::LogEntry>& entries() const { return entries_; }
    // The lines of a level or above, in order, with their private arguments revealed.
    std::vector<std::string> messages(platform::Level minimum = platform::Level::Debug) const;
    // How many lines have the format, and whether any has.
    int count(std::string_view format) const;
    bool contains(std::string_view format) const { return count(format) > 0; }
    // The last line of the format, with its private arguments revealed; empty when there is none.
    std::string lastMessage(std::string_view format) const;
    void clear() { entries_.clear(); }

private:
    std::vector<platform::LogEntry> entries_;
};

}  // namespace vrx::sim
