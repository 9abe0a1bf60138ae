#include "vrx/host/bus/bus_service.h"

#include <algorithm>
#include <cstring>
#include <exception>
#include <memory>
#include <utility>
#include <vector>

#include "vrx/platform/log.h"
#include "vrx/wire/message.h"

namespace vrx::host {

namespace {

constexpr const char* daemon = "org.freedesktop.DBus";
constexpr const char* daemonPath = "/org/freedesktop/DBus";

// sd-bus is C, which no exception may cross.
template <class Function>
int guarded(Function function) {
    try {
        function();
    } catch (const std::exception& error) {
        platform::log(platform::Level::Error, "A message of the system bus could not be taken: %@", error.what());
    }
    return 0;
}

}  // namespace

BusService::BusService(SystemBus& bus, std::string name, Activation activation)
    : bus_(bus), name_(std::move(name)), activation_(activation) {
    bus_.services_.push_back(this);
}

BusService::~BusService() {
    std::erase(bus_.services_, this);
}

// The bus keeps the order: what happens after the answer to the first question is signalled.
void BusService::begin() {
    end();
    add("type='signal',sender='org.freedesktop.DBus',path='/org/freedesktop/DBus',interface='org.freedesktop.DBus',"
        "member='NameOwnerChanged',arg0='" +
            name_ + "'",
        matches_, onOwnerChanged, nullptr);
    follow();
    ownerCalls_.push_back({this, [this](sd_bus_message* reply) {
                               const char* owner = nullptr;
                               if (reply && sd_bus_message_read(reply, "s", &owner) > 0) return setOwner(owner);
                               if (activation_ == Activation::ByQuestion) return askNow();
                               left();
                           }});
    sd_bus_slot* slot = nullptr;
    sd_bus_call_method_async(bus_.connection(), &slot, daemon, daemonPath, daemon, "GetNameOwner", onReply,
                             &ownerCalls_.back(), "s", name_.c_str());
    ownerCalls_.back().slot.reset(slot);
}

void BusService::end() {
    matches_.clear();
    changingMatches_.clear();
    forgetQuestions();
    ownerCalls_.clear();
    if (!std::exchange(owner_, "").empty()) left();
}

// Answers of an owner that has gone since do not count. One that has come while a question is open was started by it,
// and is going to answer it.
void BusService::setOwner(const std::string& owner) {
    if (owner == owner_) return;
    const bool isStartedByQuestion = owner_.empty() && !calls_.empty();
    owner_ = owner;
    if (isStartedByQuestion) return;
    forgetQuestions();
    owner_.empty() ? left() : askNow();
}

void BusService::askNow() {
    isQuestionOpen_ = true;
    ask();
}

void BusService::forgetQuestions() {
    calls_.clear();
    again_.reset();
    isQuestionOpen_ = false;
}

void BusService::askAgainLater(platform::Duration pause) {
    if (!isQuestionOpen_ && !again_) callAfter(again_, pause, [this] { askNow(); });
}

void BusService::add(const std::string& rule, std::list<Callback>& list, sd_bus_message_handler_t onMessage,
                     Handler handler) {
    list.push_back({this, std::move(handler)});
    sd_bus_slot* slot = nullptr;
    sd_bus_add_match_async(bus_.connection(), &slot, rule.c_str(), onMessage, nullptr, &list.back());
    list.back().slot.reset(slot);
}

void BusService::match(const std::string& rule, Handler handler) {
    add("type='signal',sender='" + name_ + "'," + rule, matches_, onSignal, std::move(handler));
}

void BusService::matchInstead(const std::vector<std::string>& rules, const Handler& handler) {
    std::list<Callback> matches;
    for (const std::string& rule : rules)
        add("type='signal',sender='" + name_ + "'," + rule, matches, onSignal, handler);
    changingMatches_.swap(matches);
}

void BusService::call(const std::string& path, const char* interface, const char* member, Handler handler,
                      std::initializer_list<const char*> arguments) {
    call(path, interface, member, std::move(handler), [&](sd_bus_message* message) {
        int r = 0;
        for (const char* argument : arguments)
            if (r >= 0) r = sd_bus_message_append_basic(message, 's', argument);
        return r;
    });
}

void BusService::call(const std::string& path, const char* interface, const char* member, Handler handler,
                      const Append& append) {
    sd_bus_message* made = nullptr;
    int r = sd_bus_message_new_method_call(bus_.connection(), &made, name_.c_str(), path.c_str(), interface, member);
    const wire::MessagePointer message(made);
    if (r >= 0) r = sd_bus_message_set_auto_start(made, activation_ == Activation::ByQuestion);
    if (r >= 0) r = append(made);
    calls_.push_back({this, std::move(handler)});
    sd_bus_slot* slot = nullptr;
    if (r >= 0) r = sd_bus_call_async(bus_.connection(), &slot, made, onReply, &calls_.back(), 0);
    if (r < 0) return calls_.pop_back();
    calls_.back().slot.reset(slot);
}

void BusService::callAfter(EventSource& timer, platform::Duration delay, std::function<void()> then, clockid_t clock) {
    constexpr platform::Duration mostAccuracy{0.25};
    const auto microseconds = [](platform::Duration duration) {
        return static_cast<std::uint64_t>(std::chrono::ceil<std::chrono::microseconds>(duration).count());
    };
    auto call = std::make_unique<std::function<void()>>([&timer, then = std::move(then)] {
        timer.reset();
        then();
    });
    const auto onTime = [](sd_event_source*, std::uint64_t, void* userdata) {
        return guarded(*static_cast<std::function<void()>*>(userdata));
    };
    sd_event_source* source = nullptr;
    if (sd_event_add_time_relative(bus_.loop_, &source, clock, microseconds(delay),
                                   microseconds(std::min(delay / 4, mostAccuracy)), onTime, call.get()) < 0)
        return;
    timer.reset(source);
    // It goes with the source, which outlives its own call.
    sd_event_source_set_destroy_callback(source, [](void* done) { delete static_cast<std::function<void()>*>(done); });
    static_cast<void>(call.release());
}

int BusService::onOwnerChanged(sd_bus_message* message, void* callback, sd_bus_error*) {
    const char* sender = sd_bus_message_get_sender(message);
    if (!sender || std::strcmp(sender, daemon) != 0) return 0;
    BusService& self = *static_cast<Callback*>(callback)->service;
    const char *name = nullptr, *before = nullptr, *after = nullptr;
    if (sd_bus_message_read(message, "sss", &name, &before, &after) <= 0 || self.name_ != name) return 0;
    return guarded([&] { self.setOwner(after); });
}

int BusService::onSignal(sd_bus_message* message, void* userdata, sd_bus_error*) {
    const auto& callback = *static_cast<Callback*>(userdata);
    const char* sender = sd_bus_message_get_sender(message);
    if (!sender || callback.service->owner_ != sender) return 0;
    return guarded([&] { callback.handler(message); });
}

int BusService::onReply(sd_bus_message* message, void* userdata, sd_bus_error*) {
    auto* callback = static_cast<Callback*>(userdata);
    BusService& self = *callback->service;
    // It may end the calls, this one among them.
    const Handler handler = std::move(callback->handler);
    for (auto* calls : {&self.calls_, &self.ownerCalls_})
        calls->remove_if([callback](const Callback& call) { return &call == callback; });
    return guarded([&] { handler(sd_bus_message_is_method_error(message, nullptr) > 0 ? nullptr : message); });
}

}  // namespace vrx::host
