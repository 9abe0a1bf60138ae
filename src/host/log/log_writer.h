// Writes the log's lines on a thread of its own, in batches and in their order, so that a thread that logs does not
// wait for the file or the journal. A line is written within milliseconds, at once by flush(), and before the process
// ends, also when it crashes; kill -9 loses the last milliseconds. The thread starts with the first line and sleeps
// while there is none.
//
// A pipe that nobody reads stops nobody who logs: lines that it does not take in time are left out, and counted in
// the next line.
#pragma once

#include <condition_variable>
#include <mutex>
#include <string_view>
#include <thread>

#include "vrx/host/base/descriptor.h"
#include "vrx/host/base/request_scope.h"

namespace vrx::host {

class LogWriter final : public LogLinesTaker {
public:
    enum class Form {
        Lines,  // to the file
        // A line goes through the journal's stream. One that has fields, NAME=VALUE lines, is a datagram. What the
        // journal does not take goes to the file.
        Journal,
    };

    // The file is not owned.
    LogWriter(int file, Form form);
    // Writes what is left.
    ~LogWriter() override;
    LogWriter(const LogWriter&) = delete;
    LogWriter& operator=(const LogWriter&) = delete;

    // A line, or one that has fields, ends with a line break.
    void take(const LogLines& lines) override;
    // Returns when everything that was added before has been written.
    void flush();

private:
    class CrashGuard;

    void run();
    bool isEnough() const;  // under mutex_
    void write(const LogLines& lines);
    void writeToFile(std::string_view bytes);
    bool hasRoomInPipe();
    void writeToJournal(std::string_view lines);
    void sendToJournal(std::string_view fields);
    void flushInCrash();

    const int file_;
    const Descriptor pipe_;  // the file, opened anew so as not to block, if it is a pipe
    const Form form_;

    std::mutex writing_;       // taken before mutex_
    LogLines written_;         // its memory is used again; under writing_
    std::size_t leftOut_ = 0;  // bytes; under writing_
    Descriptor stream_;        // the journal's; under writing_

    std::mutex mutex_;
    std::condition_variable changed_;
    std::condition_variable hasRoom_;
    LogLines pending_;
    bool isIdle_ = false;  // the thread waits for a first line
    bool isEnding_ = false;
    std::thread thread_;
};

}  // namespace vrx::host
