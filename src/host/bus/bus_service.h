// One service on the system bus, under its well-known name: follows who owns the name, what it signals, and asks it.
// What comes from anybody else is not looked at: whoever is on the bus can send a signal to this connection. Main
// thread.
#pragma once

#include <systemd/sd-bus.h>

#include <functional>
#include <initializer_list>
#include <list>
#include <string>
#include <vector>

#include "vrx/host/bus/system_bus.h"

namespace vrx::host {

class BusService {
public:
    // Whether a question may start the service.
    enum class Activation { Never, ByQuestion };
    static constexpr platform::Duration pauseBeforeQuestion{1};

    // The bus must outlive the service; services are made before it starts.
    BusService(SystemBus& bus, std::string name, Activation activation = Activation::Never);
    virtual ~BusService();
    BusService(const BusService&) = delete;
    BusService& operator=(const BusService&) = delete;

    const std::string& name() const { return name_; }
    // Whether somebody has the name.
    bool isThere() const { return !owner_.empty(); }

protected:
    // A connection has begun: here the matches are added. Questions are asked after that.
    virtual void follow() = 0;
    // The service may have come, or come anew; or it is to be asked again.
    virtual void ask() = 0;
    // It has gone, or the bus has.
    virtual void left() = 0;

    using Handler = std::function<void(sd_bus_message*)>;
    // The rule without type and sender.
    void match(const std::string& rule, Handler handler);
    // Rules that take the place of those of the last such call, without a gap. Not to be called by such a handler.
    void matchInstead(const std::vector<std::string>& rules, const Handler& handler);
    // For who uses askAgainLater(): the answer to ask() is there, or will not come.
    void answered() { isQuestionOpen_ = false; }
    // Asks again after a pause, however much is signalled: a service could make the agent ask for ever. Does nothing
    // while the answer to ask() is to come, which holds what was signalled before it.
    void askAgainLater(platform::Duration pause = pauseBeforeQuestion);
    // Calls once after the delay, or up to a quarter of it later, to wake the machine along with others. The timer is
    // empty again by then; resetting it before gives the call up. The time asleep counts with CLOCK_BOOTTIME, and not
    // with CLOCK_MONOTONIC.
    void callAfter(EventSource& timer, platform::Duration delay, std::function<void()> then,
                   clockid_t clock = CLOCK_BOOTTIME);
    // Null is handed over when there is no answer, or an error. Calls that are open when the service goes are dropped;
    // one that starts the service is open while it comes, and is not asked again.
    // The arguments are strings.
    void call(const std::string& path, const char* interface, const char* member, Handler handler,
              std::initializer_list<const char*> arguments = {});
    // The same with arguments of any type, which are appended there; a negative result means that they could not be.
    using Append = std::function<int(sd_bus_message*)>;
    void call(const std::string& path, const char* interface, const char* member, Handler handler,
              const Append& append);

private:
    friend class SystemBus;
    struct Callback {
        BusService* service;
        Handler handler;
        BusSlot slot{};
    };

    void begin();
    void end();
    void setOwner(const std::string& owner);
    void askNow();
    void forgetQuestions();
    void add(const std::string& rule, std::list<Callback>& list, sd_bus_message_handler_t onMessage, Handler handler);
    static int onOwnerChanged(sd_bus_message* message, void* self, sd_bus_error*);
    static int onSignal(sd_bus_message* message, void* callback, sd_bus_error*);
    static int onReply(sd_bus_message* message, void* callback, sd_bus_error*);

    SystemBus& bus_;
    const std::string name_;
    const Activation activation_;
    std::string owner_;  // its unique name
    std::list<Callback> matches_;
    std::list<Callback> changingMatches_;
    std::list<Callback> calls_;
    std::list<Callback> ownerCalls_;
    bool isQuestionOpen_ = false;
    EventSource again_;
};

}  // namespace vrx::host
