// The log: the journal when standard error is connected to it, else a line for each entry on standard error. Private
// arguments are redacted in both, and nothing in an argument can begin a line. Any thread may log. An error is written
// before the call returns, everything else soon after.
#pragma once

#include "vrx/host/log/log_writer.h"
#include "vrx/platform/log.h"

namespace vrx::host {

class SystemLog final : public platform::SystemLog {
public:
    // Entries below the level are dropped. Lines go to the given file, which is not owned.
    explicit SystemLog(platform::Level lowest = platform::Level::Default, int file = 2);

    bool isOn(platform::Level level) const override { return level >= lowest_; }
    void write(const platform::LogEntry& entry) override;

    // Writes what is pending. For code that is about to end the process abruptly.
    void flush() { writer_.flush(); }

private:
    const platform::Level lowest_;
    const bool isJournal_;
    LogWriter writer_;
};

}  // namespace vrx::host
