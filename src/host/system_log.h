// The log: the journal when standard error is connected to it, else one line an entry on standard error. Private
// arguments are redacted in both, and nothing in an argument can begin a line of its own. Any thread may log.
#pragma once

#include "platform/log.h"

namespace vrx::host {

class SystemLog final : public platform::SystemLog {
public:
    // Entries below the level are dropped. Lines go to the given file, which is not owned.
    explicit SystemLog(platform::Level lowest = platform::Level::Default, int file = 2);

    bool isOn(platform::Level level) const override { return level >= lowest_; }
    void write(const platform::LogEntry& entry) override;

private:
    void writeToJournal(const platform::LogEntry& entry) const;
    void writeLine(const platform::LogEntry& entry) const;

    const platform::Level lowest_;
    const int file_;
    const bool isJournal_;
};

}  // namespace vrx::host
