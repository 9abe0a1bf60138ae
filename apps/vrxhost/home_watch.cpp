#include "vrxhost/home_watch.h"

#include <poll.h>
#include <sys/inotify.h>
#include <sys/signalfd.h>
#include <sys/timerfd.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cmath>
#include <csignal>
#include <filesystem>
#include <system_error>

#include "vrx/platform/number_text.h"

namespace vrx::apps {

namespace {

host::Descriptor opened(int file, const char* what) {
    if (file < 0) throw std::system_error(errno, std::generic_category(), what);
    return host::Descriptor(file);
}

int signalFile() {
    sigset_t set;
    sigemptyset(&set);
    sigaddset(&set, SIGINT);
    sigaddset(&set, SIGTERM);
    sigprocmask(SIG_BLOCK, &set, nullptr);
    return signalfd(-1, &set, SFD_CLOEXEC);
}

void drain(int file) {
    std::array<char, 4096> unused;
    while (read(file, unused.data(), unused.size()) > 0) {
    }
}

}  // namespace

HomeWatch::HomeWatch(Home& home)
    : home_(home),
      changes_(opened(inotify_init1(IN_CLOEXEC | IN_NONBLOCK), "inotify_init")),
      signals_(opened(signalFile(), "signalfd")),
      timer_(opened(timerfd_create(CLOCK_REALTIME, TFD_CLOEXEC | TFD_NONBLOCK), "timerfd_create")) {
    // A commit writes to the log beside the database.
    constexpr std::uint32_t events =
        IN_MODIFY | IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO | IN_DELETE_SELF | IN_MOVE_SELF;
    if (inotify_add_watch(changes_.number(), home.path().c_str(), events) < 0)
        throw std::system_error(errno, std::generic_category(), "inotify_add_watch");
}

HomeWatch::Wake HomeWatch::wait(std::optional<platform::Date> latest) {
    arm(latest);
    std::array<pollfd, 3> files{
        {{signals_.number(), POLLIN, 0}, {changes_.number(), POLLIN, 0}, {timer_.number(), POLLIN, 0}}};
    while (poll(files.data(), files.size(), -1) < 0 && errno == EINTR) {
    }
    if (files[0].revents) return Wake::End;
    drain(changes_.number());
    drain(timer_.number());
    std::error_code ignored;
    if (!std::filesystem::exists(Home::databasePath(home_.path()), ignored)) return Wake::Gone;
    return letWritersFinish();
}

// Uses the wall clock. Setting that clock also ends the wait.
void HomeWatch::arm(std::optional<platform::Date> latest) const {
    itimerspec due{};
    if (latest) {
        const double seconds = platform::epochSeconds(*latest);
        due.it_value.tv_sec = platform::clampedInteger(std::floor(seconds));
        due.it_value.tv_nsec = static_cast<long>((seconds - std::floor(seconds)) * 1e9);
    }
    timerfd_settime(timer_.number(), TFD_TIMER_ABSTIME | TFD_TIMER_CANCEL_ON_SET, &due, nullptr);
}

// Waits for the writer's lock: a writer changes the files first and then commits by a memory write that inotify does
// not report.
HomeWatch::Wake HomeWatch::letWritersFinish() {
    pollfd ended{signals_.number(), POLLIN, 0};
    while (true) {
        const platform::MaybeError error = home_.database().write([](host::Connection&) {});
        if (!error || !isHeldByAnother(*error)) return Wake::Look;
        if (poll(&ended, 1, 0) > 0) return Wake::End;
    }
}

}  // namespace vrx::apps
