// Writes the log's records on a thread of its own, in batches and in their order, so that a thread that logs does not
// wait for the file or the journal. A record is written within milliseconds, at once by flush(), and before the process
// ends, also when it crashes; kill -9 loses the last milliseconds. The thread starts with the first record and sleeps
// while there is none.
//
// A pipe that nobody reads stops nobody who logs: records that it does not take in time are left out, and counted in
// the next line.
#pragma once

#include <condition_variable>
#include <mutex>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "vrx/host/base/descriptor.h"

namespace vrx::host {

class LogWriter {
public:
    enum class Form {
        Lines,    // to the file
        Journal,  // NAME=VALUE lines, a datagram each; to the file what the journal does not take
    };

    // The file is not owned.
    LogWriter(int file, Form form);
    // Writes what is left.
    ~LogWriter();
    LogWriter(const LogWriter&) = delete;
    LogWriter& operator=(const LogWriter&) = delete;

    // A record ends with a line break.
    void add(std::string_view record);
    // Returns when everything that was added before has been written.
    void flush();

private:
    struct Batch {
        std::string bytes;
        std::vector<std::size_t> ends;  // of its records
        std::string_view record(std::size_t index) const;
    };
    class CrashGuard;

    void run();
    bool isEnough() const;  // under mutex_
    void write(const Batch& batch);
    void writeToFile(std::string_view bytes);
    bool hasRoomInPipe();
    void sendToJournal(const Batch& batch);
    void sendLargeToJournal(std::string_view record);
    void flushInCrash();

    const int file_;
    const Descriptor pipe_;     // the file, opened anew so as not to block, if it is a pipe
    const Descriptor journal_;  // a socket; none for lines

    std::mutex writing_;       // taken before mutex_
    Batch writtenBatch_;       // its memory is used again; under writing_
    std::size_t leftOut_ = 0;  // bytes; under writing_

    std::mutex mutex_;
    std::condition_variable changed_;
    std::condition_variable hasRoom_;
    Batch pending_;
    bool isIdle_ = false;  // the thread waits for a first record
    bool isEnding_ = false;
    std::thread thread_;
};

}  // namespace vrx::host
