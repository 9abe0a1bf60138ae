// vrx-settings-notify: tells the user of the coverage offers that are pending. It waits on the agent and on the session
// bus, and does nothing in between.
#include <sys/eventfd.h>
#include <systemd/sd-bus.h>
#include <systemd/sd-event.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <utility>
#include <vector>

#include "settings/notifier.h"
#include "settings/words.h"
#include "vrx/client/changes.h"

namespace vrx::settings {
namespace {

using client::Answer;
using client::FollowUp;

// The main loop, to which any thread may bring a call.
class Loop {
public:
    Loop() {
        sd_event_default(&event_);
        sd_event_add_io(event_, nullptr, wake_, EPOLLIN, &Loop::woken, this);
        sigset_t ends;
        sigemptyset(&ends);
        for (const int number : {SIGINT, SIGTERM}) {
            sigaddset(&ends, number);
            pthread_sigmask(SIG_BLOCK, &ends, nullptr);
            sd_event_add_signal(event_, nullptr, number, nullptr, nullptr);  // ends the loop with 0
        }
    }
    ~Loop() {
        sd_event_unref(event_);
        ::close(wake_);
    }
    Loop(const Loop&) = delete;
    Loop& operator=(const Loop&) = delete;

    sd_event* event() const { return event_; }

    void post(std::function<void()> call) {
        std::lock_guard lock(mutex_);
        calls_.push_back(std::move(call));
        eventfd_write(wake_, 1);
    }

private:
    static int woken(sd_event_source*, int file, std::uint32_t, void* data) {
        auto* self = static_cast<Loop*>(data);
        std::vector<std::function<void()>> calls;
        {
            std::lock_guard lock(self->mutex_);
            eventfd_t count = 0;
            eventfd_read(file, &count);
            calls.swap(self->calls_);
        }
        for (const auto& call : calls) call();
        return 0;
    }

    sd_event* event_ = nullptr;
    const int wake_ = eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
    std::mutex mutex_;
    std::vector<std::function<void()>> calls_;
};

// Asks for the follow-ups when they may have changed, and when the first of them expires.
class Watch {
public:
    Watch(Loop& loop, Notifier& notifier) : loop_(loop), notifier_(notifier) {
        changes_.emplace([this](const client::Change& change) {
            if (change.followUps) loop_.post([this] { look(); });
        });
    }
    ~Watch() {
        changes_.reset();
        sd_event_source_disable_unref(expiration_);
    }
    Watch(const Watch&) = delete;
    Watch& operator=(const Watch&) = delete;

private:
    void look() {
        if (std::exchange(isLooking_, true)) {
            isAnotherDue_ = true;
            return;
        }
        isAnotherDue_ = false;
        followUps_.pending(
            [this](const Answer<std::vector<FollowUp>>& answer) { loop_.post([this, answer] { looked(answer); }); });
    }

    // What is shown stays while the agent cannot be asked.
    void looked(const Answer<std::vector<FollowUp>>& answer) {
        isLooking_ = false;
        if (answer) {
            notifier_.show(*answer);
            setExpiration(*answer);
        }
        if (isAnotherDue_) look();
    }

    void setExpiration(const std::vector<FollowUp>& followUps) {
        expiration_ = sd_event_source_disable_unref(expiration_);
        std::optional<platform::Date> first;
        for (const FollowUp& followUp : followUps)
            if (followUp.expirationDate && (!first || *followUp.expirationDate < *first))
                first = followUp.expirationDate;
        constexpr double latest = 1e11;  // seconds; later than anyone waits
        if (!first || platform::epochSeconds(*first) > latest) return;
        const double microseconds = std::max(0.0, platform::epochSeconds(*first)) * 1e6 + 1e3;
        const auto expired = [](sd_event_source*, std::uint64_t, void* self) {
            static_cast<Watch*>(self)->look();
            return 0;
        };
        sd_event_add_time(loop_.event(), &expiration_, CLOCK_REALTIME, static_cast<std::uint64_t>(microseconds), 0,
                          expired, this);
    }

    Loop& loop_;
    Notifier& notifier_;
    bool isLooking_ = false, isAnotherDue_ = false;
    sd_event_source* expiration_ = nullptr;
    client::FollowUps followUps_;
    std::optional<client::Changes> changes_;
};

// The bus sends what waits, and closes, at the end of the loop: this comes before.
void takeBackAtEnd(sd_event* event, Notifier& notifier) {
    sd_event_source* source = nullptr;
    const auto end = [](sd_event_source*, void* notifier) {
        static_cast<Notifier*>(notifier)->takeBack();
        return 0;
    };
    sd_event_add_exit(event, &source, end, &notifier);
    sd_event_source_set_priority(source, SD_EVENT_PRIORITY_IMPORTANT);
    sd_event_source_set_floating(source, 1);
    sd_event_source_unref(source);
}

int run() {
    useTranslations();
    Loop loop;  // blocks the signals before there is another thread
    sd_bus* opened = nullptr;
    if (const int code = sd_bus_open_user(&opened); code < 0) {
        std::fprintf(stderr, "vrx-settings-notify: no session bus: %s\n", std::strerror(-code));
        return 1;
    }
    const std::unique_ptr<sd_bus, decltype(&sd_bus_flush_close_unref)> bus(opened, sd_bus_flush_close_unref);
    sd_bus_set_exit_on_disconnect(bus.get(), 1);
    sd_bus_attach_event(bus.get(), loop.event(), SD_EVENT_PRIORITY_NORMAL);
    Notifier notifier(bus.get(), Remembered(Remembered::usualFile()));
    takeBackAtEnd(loop.event(), notifier);
    const Watch watch(loop, notifier);
    const int code = sd_event_loop(loop.event());
    return code < 0 ? 1 : code;
}

}  // namespace
}  // namespace vrx::settings

int main() {
    return vrx::settings::run();
}
