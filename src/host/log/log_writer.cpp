#include "vrx/host/log/log_writer.h"

#define SD_JOURNAL_SUPPRESS_LOCATION  // the records bring their own
#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <sys/un.h>
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

sockaddr_un journalAddress() {
    return {AF_UNIX, "/run/systemd/journal/socket"};
}

Descriptor openJournal() {
    Descriptor journal(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    constexpr int size = 8 * 1024 * 1024;  // the journal may be slow for a while
    if (journal) setsockopt(journal.number(), SOL_SOCKET, SO_SNDBUF, &size, sizeof size);
    return journal;
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

LogWriter::LogWriter(int file, Form form)
    : file_(file), pipe_(openPipe(file)), journal_(form == Form::Journal ? openJournal() : Descriptor()) {
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

std::string_view LogWriter::Batch::record(std::size_t index) const {
    const std::size_t begin = index == 0 ? 0 : ends[index - 1];
    return std::string_view(bytes).substr(begin, ends[index] - begin);
}

void LogWriter::add(std::string_view record) {
    std::unique_lock lock(mutex_);
    hasRoom_.wait(lock, [this] { return pending_.bytes.size() <= mostPending; });
    const bool wasEnough = isEnough();
    pending_.bytes += record;
    pending_.ends.push_back(pending_.bytes.size());
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
        isIdle_ = pending_.ends.empty();
        if (isIdle_) changed_.wait(lock, [this] { return isEnding_ || !isIdle_; });
        changed_.wait_for(lock, gatheringTime, [this] { return isEnding_ || isEnough(); });
        lock.unlock();
        flush();
        lock.lock();
    }
}

void LogWriter::flush() {
    std::lock_guard writing(writing_);
    writtenBatch_.bytes.clear();
    writtenBatch_.ends.clear();
    {
        std::lock_guard lock(mutex_);
        std::swap(pending_, writtenBatch_);
    }
    hasRoom_.notify_all();
    write(writtenBatch_);
}

void LogWriter::write(const Batch& batch) {
    if (journal_) return sendToJournal(batch);
    // Joins lines up to PIPE_BUF: a write of that size is not mixed with those of other processes.
    for (std::size_t begin = 0, next = 0; next < batch.ends.size();) {
        std::size_t end = batch.ends[next++];
        while (next < batch.ends.size() && batch.ends[next] - begin <= PIPE_BUF) end = batch.ends[next++];
        writeToFile(std::string_view(batch.bytes).substr(begin, end - begin));
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

// Sends as many datagrams as possible with one system call.
void LogWriter::sendToJournal(const Batch& batch) {
    constexpr std::size_t most = 64;
    sockaddr_un address = journalAddress();
    for (std::size_t next = 0; next < batch.ends.size();) {
        std::array<iovec, most> parts;
        std::array<mmsghdr, most> messages{};
        const std::size_t count = std::min(most, batch.ends.size() - next);
        for (std::size_t i = 0; i < count; ++i) {
            const std::string_view record = batch.record(next + i);
            parts[i] = {const_cast<char*>(record.data()), record.size()};
            messages[i].msg_hdr.msg_name = &address;
            messages[i].msg_hdr.msg_namelen = sizeof address;
            messages[i].msg_hdr.msg_iov = &parts[i];
            messages[i].msg_hdr.msg_iovlen = 1;
        }
        const int sent = sendmmsg(journal_.number(), messages.data(), static_cast<unsigned>(count), MSG_NOSIGNAL);
        if (sent > 0) {
            next += static_cast<std::size_t>(sent);
        } else if (errno != EINTR) {
            sendLargeToJournal(batch.record(next++));
        }
    }
}

// For a record that is too large for a datagram, which the journal's library can send, or when there is no journal.
void LogWriter::sendLargeToJournal(std::string_view record) {
    std::vector<iovec> fields;
    for (std::string_view rest = record; !rest.empty();) {
        const std::size_t end = std::min(rest.find('\n'), rest.size() - 1);
        fields.push_back({const_cast<char*>(rest.data()), end});
        rest.remove_prefix(end + 1);
    }
    if (sd_journal_sendv(fields.data(), static_cast<int>(fields.size())) < 0) writeToFile(record);
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
    if (lockInTime(writing_) && lockInTime(mutex_)) write(pending_);
}

}  // namespace vrx::host
