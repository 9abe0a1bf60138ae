#include "vrx/host/ipc/refusals.h"

#include <fcntl.h>
#include <poll.h>

#include <algorithm>
#include <map>
#include <system_error>
#include <vector>

#include "vrx/host/ipc/server_bus.h"

namespace vrx::host {

using std::chrono::steady_clock;

// One refused client.
class Refusals::Refused {
public:
    Refused(Descriptor socket, const ucred& peer, const char* errorName, std::string text, steady_clock::time_point end)
        : user_(peer.uid), bus_(std::move(socket), peer.pid), errorName_(errorName), text_(std::move(text)), end_(end) {
        if (bus_.bus()) sd_bus_add_filter(bus_.bus(), nullptr, onMessage, this);
    }

    // Does what is possible without waiting. Returns whether more is to come.
    bool goesOn(steady_clock::time_point now) {
        ServerBus::Step step = ServerBus::Step::Progress;
        while (step == ServerBus::Step::Progress && !(isAnswered_ && bus_.unsentMessages() == 0)) step = bus_.step();
        return step == ServerBus::Step::Idle && now < end_ && !(bus_.isReadToTheEnd() && bus_.unsentMessages() == 0);
    }

    pollfd waitFor() const { return {bus_.socket(), bus_.events(), 0}; }
    steady_clock::time_point end() const { return end_; }
    uid_t user() const { return user_; }

private:
    static int onMessage(sd_bus_message* message, void* self, sd_bus_error*) {
        return static_cast<Refused*>(self)->answer(message);
    }

    // Introspection does not count, because tools introspect before the call that they mean.
    int answer(sd_bus_message* message) {
        std::uint8_t type = 0;
        sd_bus_message_get_type(message, &type);
        if (type != SD_BUS_MESSAGE_METHOD_CALL) return 0;
        if (sd_bus_message_is_method_call(message, "org.freedesktop.DBus", "Hello") > 0) return 0;
        sd_bus_reply_method_errorf(message, errorName_, "%s", text_.c_str());
        isAnswered_ = sd_bus_message_is_method_call(message, "org.freedesktop.DBus.Introspectable", nullptr) <= 0;
        return 1;
    }

    const uid_t user_;
    ServerBus bus_;
    const char* const errorName_;
    const std::string text_;
    const steady_clock::time_point end_;
    bool isAnswered_ = false;
};

Refusals::Refusals(const ServiceLimits& limits) : limits_(limits) {
    keepSpare();
}

void Refusals::keepSpare() {
    for (Descriptor& file : spare_) file = Descriptor(fcntl(wakeFile_.number(), F_DUPFD_CLOEXEC, 0));
}

Refusals::~Refusals() {
    {
        std::lock_guard lock(mutex_);
        isStopping_ = true;
    }
    eventfd_write(wakeFile_.number(), 1);
    if (thread_.joinable()) thread_.join();
}

void Refusals::refuse(Descriptor socket, const ucred& peer, const char* errorName, std::string text) {
    if (!thread_.joinable()) {
        try {
            thread_ = std::thread([this] { run(); });
        } catch (const std::system_error&) {
            return;  // without a thread the client learns nothing
        }
    }
    for (Descriptor& file : spare_) file = Descriptor();
    {
        std::lock_guard lock(mutex_);
        arriving_.push_back(std::make_unique<Refused>(std::move(socket), peer, errorName, std::move(text),
                                                      steady_clock::now() + limits_.refusal));
    }
    keepSpare();
    eventfd_write(wakeFile_.number(), 1);
}

void Refusals::run() {
    pthread_setname_np(pthread_self(), "refusals");
    while (true) {
        {
            std::lock_guard lock(mutex_);
            if (isStopping_) break;
            present_.splice(present_.end(), arriving_);
        }
        const int timeout = serveAll();
        std::vector<pollfd> files{{wakeFile_.number(), POLLIN, 0}};
        for (const auto& refused : present_) files.push_back(refused->waitFor());
        if (poll(files.data(), files.size(), timeout) < 0) pauseAfterFailedPoll();
        eventfd_t count;
        eventfd_read(wakeFile_.number(), &count);
    }
    present_.clear();
}

void Refusals::removeSurplus() {
    while (present_.size() > limits_.refusals) {
        std::map<uid_t, std::size_t> counts;
        for (const auto& refused : present_) ++counts[refused->user()];
        const uid_t user = std::ranges::max_element(counts, {}, [](const auto& count) { return count.second; })->first;
        present_.erase(std::ranges::find(present_, user, [](const auto& refused) { return refused->user(); }));
    }
}

// Serves all, and removes those that have ended. Returns the milliseconds until the first of the others times out, or
// -1.
int Refusals::serveAll() {
    const auto now = steady_clock::now();
    std::erase_if(present_, [now](auto& refused) { return !refused->goesOn(now); });
    removeSurplus();
    if (present_.empty()) return -1;
    const auto first = std::ranges::min_element(present_, {}, [](auto& refused) { return refused->end(); });
    return static_cast<int>(std::chrono::ceil<std::chrono::milliseconds>((*first)->end() - now).count());
}

}  // namespace vrx::host
