#include "vrx/client/changes.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <mutex>
#include <thread>
#include <utility>

#include "vrx/client/agent_bus.h"
#include "vrx/wire/locations.h"

namespace vrx::client {

namespace {

constexpr std::chrono::seconds firstPause(1), longestPause(60), longestConnecting(10);

Failure failureOf(const platform::Error& error) {
    return {error.code == ETIMEDOUT ? Failure::Kind::TimedOut : Failure::Kind::NotReachable, error.text};
}

}  // namespace

class Changes::Listener {
public:
    Listener(Handler handler, ConnectionOptions options)
        : handler_(std::move(handler)),
          socketPath_(options.socketPath.empty() ? wire::findAgent().socket.path : std::move(options.socketPath)),
          connecting_(std::min<platform::Duration>(options.timeLimit, longestConnecting)),
          thread_([this] { run(); }) {}

    ~Listener() {
        isStopping_ = true;
        eventfd_write(wakeFile_, 1);
        {
            std::lock_guard lock(mutex_);
            if (bus_) bus_->interrupt();
        }
        thread_.join();
        ::close(wakeFile_);
    }

private:
    void run() {
        for (auto pause = firstPause; !isStopping_; pause = std::min(2 * pause, longestPause)) {
            const std::optional<Failure> failure = listen(pause);
            if (isStopping_) return;
            if (failure && !std::exchange(isFailing_, true)) handler_({.failure = failure});
            pollfd wake{wakeFile_, POLLIN, 0};
            poll(&wake, 1, static_cast<int>(std::chrono::milliseconds(pause).count()));
        }
    }

    // Returns when the connection has ended, or a failure when it could not be made. One that was made begins the
    // pauses anew; that it ended is told only if there is no other, because the agent may just start anew.
    std::optional<Failure> listen(std::chrono::seconds& pause) {
        AgentBus bus;
        const Deadline deadline = std::chrono::steady_clock::now() +
                                  std::chrono::duration_cast<std::chrono::steady_clock::duration>(connecting_);
        if (const auto error = bus.open(socketPath_, deadline)) return failureOf(*error);
        const Use use(*this, bus);
        bus.setOnChanged([this](std::string_view interface) {
            if (interface == wire::followUpsInterface.name) handler_({.followUps = true});
            if (interface == wire::coverageInterface.name) handler_({.coverage = true});
        });
        for (const auto& [interface, operation] : {std::pair(&wire::followUpsInterface, &wire::subscribeToFollowUps),
                                                   std::pair(&wire::coverageInterface, &wire::subscribeToCoverage)}) {
            const CallResult result = bus.call(*operation, {}, deadline, *interface);
            if (const auto* failure = std::get_if<Failure>(&result)) return *failure;
            if (const auto* ended = std::get_if<ConnectionEnded>(&result))
                return Failure{Failure::Kind::NotReachable, ended->text};
        }
        pause = firstPause;
        isFailing_ = false;
        handler_({.followUps = true, .coverage = true});
        bus.listen(wakeFile_);
        return std::nullopt;
    }

    // Lets the destructor interrupt the connection.
    class Use {
    public:
        Use(Listener& listener, const AgentBus& bus) : listener_(listener) {
            std::lock_guard lock(listener_.mutex_);
            listener_.bus_ = &bus;
            if (listener_.isStopping_) bus.interrupt();
        }
        ~Use() {
            std::lock_guard lock(listener_.mutex_);
            listener_.bus_ = nullptr;
        }
        Use(const Use&) = delete;
        Use& operator=(const Use&) = delete;

    private:
        Listener& listener_;
    };

    const Handler handler_;
    const std::string socketPath_;
    const platform::Duration connecting_;
    const int wakeFile_ = eventfd(0, EFD_CLOEXEC);
    std::atomic<bool> isStopping_ = false;
    bool isFailing_ = false;
    std::mutex mutex_;
    const AgentBus* bus_ = nullptr;
    std::thread thread_;
};

Changes::Changes(Handler handler, ConnectionOptions options)
    : listener_(std::make_unique<Listener>(std::move(handler), std::move(options))) {}

Changes::~Changes() = default;

}  // namespace vrx::client
