#include "vrx/host/log/log_writer.h"

#define SD_JOURNAL_SUPPRESS_LOCATION  // the records bring their own
#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <syslog.h>
#include <systemd/sd-journal.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <climits>
#include <csignal>
#include <cstdio>
#include <ctime>
#include <utility>

namespace vrx::host {

namespace {

// How long records are gathered, so that one wake-up writes them all.
constexpr std::chrono::milliseconds gatheringTime(5);
// With more bytes pending than this they are written at once.
constexpr std::size_t enoughPending = 16 * 1024;
// With more bytes pending than this a thread that logs waits: nothing is dropped, and memory stays bounded.
constexpr std::size_t mostPending = 64 * 1024;

// A stream of our own, for standard error may have been opened under another name. None without a journal.
Descriptor openJournalStream() {
    constexpr bool understandsPriorities = true;
    return Descriptor(
        std::max(sd_journal_stream_fd(program_invocation_short_name, LOG_INFO, understandsPriorities), -1));
}

std::string_view lineOf(const LogLines& lines, std::size_t index) {
    const std::size_t begin = index == 0 ? 0 : lines.ends[index - 1];
    return std::string_view(lines.bytes).substr(begin, lines.ends[index] - begin);
}

// Others may share the open pipe, whose mode would then change for them as well.
Descriptor openPipe(int file) {
    struct stat status;
    if (fstat(file, &status) != 0 || !S_ISFIFO(status.st_mode)) return Descriptor();
    return Descriptor(open(("/proc/self/fd/" + std::to_string(file)).c_str(), O_WRONLY | O_NONBLOCK | O_CLOEXEC));
}

}  // namespace

// At a fatal signal, lets all writers write what is pending, restores the signal's previous handler and raises it
// again.
class LogWriter::CrashGuard {
public:
    static void add(LogWriter* writer) {
        static const bool isInstalled = install();
        (void)isInstalled;
        for (auto& slot : writers()) {
            LogWriter* none = nullptr;
            if (slot.compare_exchange_strong(none, writer)) return;
        }
    }
    static void remove(LogWriter* writer) {
        for (auto& slot : writers()) {
            LogWriter* expected = writer;
            slot.compare_exchange_strong(expected, nullptr);
        }
    }

private:
    static constexpr std::array signals{SIGSEGV, SIGBUS, SIGILL, SIGFPE, SIGABRT};

    static std::array<std::atomic<LogWriter*>, 4>& writers() {
        static std::array<std::atomic<LogWriter*>, 4> writers{};
        return writers;
    }
    static std::array<struct sigaction, signals.size()>& previous() {
        static std::array<struct sigaction, signals.size()> previous{};
        return previous;
    }
    static bool install() {
        writers();
        struct sigaction action {};
        action.sa_handler = onCrash;
        sigemptyset(&action.sa_mask);
        action.sa_flags = SA_ONSTACK;
        for (std::size_t i = 0; i < signals.size(); ++i) sigaction(signals[i], &action, &previous()[i]);
        return true;
    }
    static void onCrash(int signal) {
        for (std::size_t i = 0; i < signals.size(); ++i)
            if (signals[i] == signal) sigaction(signal, &previous()[i], nullptr);
        for (auto& slot : writers())
            if (LogWriter* writer = slot.exchange(nullptr)) writer->flushInCrash();
        // A fault would repeat on return by itself; a signal that was sent would not.
        raise(signal);
    }
};

LogWriter::LogWriter(int file, Form form) : file_(file), pipe_(openPipe(file)), form_(form) {
    CrashGuard::add(this);
}

LogWriter::~LogWriter() {
    CrashGuard::remove(this);
    {
        std::lock_guard lock(mutex_);
        isEnding_ = true;
        changed_.notify_one();
    }
    if (thread_.joinable()) thread_.join();
    flush();
}

void LogWriter::take(const LogLines& lines) {
    std::unique_lock lock(mutex_);
    hasRoom_.wait(lock, [this] { return pending_.bytes.size() <= mostPending; });
    const bool wasEnough = isEnough();
    pending_.append(lines);
    if (!thread_.joinable()) {
        // The new thread takes no signals.
        sigset_t all, before;
        sigfillset(&all);
        pthread_sigmask(SIG_SETMASK, &all, &before);
        thread_ = std::thread([this] { run(); });
        pthread_sigmask(SIG_SETMASK, &before, nullptr);
    } else if (std::exchange(isIdle_, false) || isEnough() != wasEnough) {
        changed_.notify_one();
    }
}

bool LogWriter::isEnough() const {
    return pending_.bytes.size() > enoughPending;
}

void LogWriter::run() {
    pthread_setname_np(pthread_self(), "log");
    std::unique_lock lock(mutex_);
    while (!isEnding_) {
        isIdle_ = pending_.isEmpty();
        if (isIdle_) changed_.wait(lock, [this] { return isEnding_ || !isIdle_; });
        changed_.wait_for(lock, gatheringTime, [this] { return isEnding_ || isEnough(); });
        lock.unlock();
        flush();
        lock.lock();
    }
}

void LogWriter::flush() {
    std::lock_guard writing(writing_);
    written_.clear();
    {
        std::lock_guard lock(mutex_);
        std::swap(pending_, written_);
    }
    hasRoom_.notify_all();
    write(written_);
}

// Joins lines, up to PIPE_BUF for a file: a write of that size is not mixed with those of other processes.
void LogWriter::write(const LogLines& lines) {
    const bool isJournal = form_ == Form::Journal;
    const std::size_t most = isJournal ? mostPending : PIPE_BUF;
    const auto hasFields = [&](std::size_t i) { return isJournal && !lineOf(lines, i).starts_with('<'); };
    for (std::size_t begin = 0, next = 0; next < lines.ends.size();) {
        const bool isAlone = hasFields(next);
        std::size_t end = lines.ends[next++];
        while (!isAlone && next < lines.ends.size() && !hasFields(next) && lines.ends[next] - begin <= most)
            end = lines.ends[next++];
        const std::string_view bytes = std::string_view(lines.bytes).substr(begin, end - begin);
        isAlone ? sendToJournal(bytes) : isJournal ? writeToJournal(bytes) : writeToFile(bytes);
        begin = end;
    }
}

void LogWriter::writeToFile(std::string_view bytes) {
    if (leftOut_ > 0 && hasRoomInPipe()) {
        std::array<char, 96> line;  // on the stack, for a crash may have been in the allocator
        const int size =
            std::snprintf(line.data(), line.size(), "(%zu bytes of the log were left out: nobody read it)\n", leftOut_);
        if (::write(pipe_.number(), line.data(), static_cast<std::size_t>(size)) > 0) leftOut_ = 0;
    }
    while (!bytes.empty()) {
        const ssize_t count = ::write(pipe_ ? pipe_.number() : file_, bytes.data(), bytes.size());
        if (count < 0 && (errno == EINTR || (errno == EAGAIN && hasRoomInPipe()))) continue;
        if (count <= 0) {
            leftOut_ += pipe_ ? bytes.size() : 0;
            return;
        }
        bytes.remove_prefix(static_cast<std::size_t>(count));
    }
}

// Gives the reader a moment, but not again and again.
bool LogWriter::hasRoomInPipe() {
    constexpr int moment = 100;  // milliseconds
    pollfd room{pipe_.number(), POLLOUT, 0};
    return pipe_ && poll(&room, 1, leftOut_ > 0 ? 0 : moment) > 0 && (room.revents & POLLOUT) != 0;
}

// A journal that was started anew takes no more on an earlier stream.
void LogWriter::writeToJournal(std::string_view lines) {
    for (int streams = 0; !lines.empty();) {
        const ssize_t count =
            stream_ ? send(stream_.number(), lines.data(), lines.size(), MSG_NOSIGNAL) : (errno = ENOTCONN, -1);
        if (count < 0 && errno == EINTR) continue;
        if (count > 0) {
            lines.remove_prefix(static_cast<std::size_t>(count));
        } else if (streams++ > 0 || !(stream_ = openJournalStream())) {
            return writeToFile(lines);
        }
    }
}

void LogWriter::sendToJournal(std::string_view fields) {
    std::array<iovec, 8> parts;  // on the stack, for a crash may have been in the allocator
    int count = 0;
    for (std::string_view rest = fields; !rest.empty() && count < static_cast<int>(parts.size());) {
        const std::size_t end = std::min(rest.find('\n'), rest.size() - 1);
        parts[static_cast<std::size_t>(count++)] = {const_cast<char*>(rest.data()), end};
        rest.remove_prefix(end + 1);
    }
    if (sd_journal_sendv(parts.data(), count) < 0) writeToFile(fields);
}

// Runs in a signal handler. The interrupted thread may hold the locks itself, so they are only tried for a while.
void LogWriter::flushInCrash() {
    auto lockInTime = [](std::mutex& mutex) {
        constexpr int tries = 50;
        constexpr timespec pause{0, 1'000'000};
        for (int i = 0; i < tries; ++i) {
            if (mutex.try_lock()) return true;
            nanosleep(&pause, nullptr);
        }
        return false;
    };
    if (!lockInTime(writing_) || !lockInTime(mutex_)) return;
    write(pending_);
    write(RequestScope::ownLines());
}

}  // namespace vrx::host
