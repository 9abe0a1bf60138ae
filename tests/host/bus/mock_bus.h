// A system bus of the test's own, with services that say what the test wants. All of it runs on the test's event loop,
// but for the bus itself and what it starts.
#pragma once

#include <spawn.h>
#include <sys/socket.h>
#include <sys/un.h>

#include <csignal>
#include <map>
#include <optional>

#include "host/support.h"
#include "support/eventually.h"
#include "vrx/host/bus/system_bus.h"
#include "vrx/host/loop/main_loop.h"

namespace vrx::host {

class MockBus {
public:
    explicit MockBus(const std::string& folder) : folder_(folder) {
        writeFile(folder + "/bus.conf",
                  "<!DOCTYPE busconfig PUBLIC '-//freedesktop//DTD D-Bus Bus Configuration 1.0//EN' "
                  "'http://www.freedesktop.org/standards/dbus/1.0/busconfig.dtd'><busconfig><type>system</type>"
                  "<listen>" +
                      address() + "</listen><servicedir>" + folder +
                      "</servicedir><policy context='default'>"
                      "<allow send_destination='*' eavesdrop='true'/><allow receive_sender='*'/><allow own='*'/>"
                      "</policy></busconfig>");
    }
    ~MockBus() { stop(); }
    MockBus(const MockBus&) = delete;
    MockBus& operator=(const MockBus&) = delete;

    std::string address() const { return "unix:path=" + folder_ + "/bus"; }

    // Comes back once it listens.
    void start() {
        const std::string configuration = "--config-file=" + folder_ + "/bus.conf";
        const char* arguments[] = {"dbus-daemon", configuration.c_str(), "--nofork", "--nopidfile", nullptr};
        ASSERT_EQ(posix_spawnp(&process_, arguments[0], nullptr, nullptr, const_cast<char**>(arguments), ::environ), 0);
        eventually([&] { return isListening(); }, "the bus");
    }
    void stop() {
        if (process_ <= 0) return;
        kill(process_, SIGKILL);
        endOf(std::exchange(process_, -1));
        std::filesystem::remove(folder_ + "/bus");
    }

private:
    // The socket's file is there a moment before that.
    bool isListening() const {
        sockaddr_un name{.sun_family = AF_UNIX, .sun_path = {}};
        (folder_ + "/bus").copy(name.sun_path, sizeof name.sun_path - 1);
        const Descriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
        return connect(socket.number(), reinterpret_cast<const sockaddr*>(&name), sizeof name) == 0;
    }

    const std::string folder_;
    pid_t process_ = -1;
};

// Objects as a service gives them to who asks for all: what appends each property, by path, interface and name.
using MockInterfaces = std::map<std::string, std::map<std::string, std::function<void(sd_bus_message*)>>>;
using MockObjects = std::map<std::string, MockInterfaces>;

inline void appendObject(sd_bus_message* message, const std::string& path, const MockInterfaces& interfaces) {
    sd_bus_message_append(message, "o", path.c_str());
    sd_bus_message_open_container(message, 'a', "{sa{sv}}");
    for (const auto& [interface, properties] : interfaces) {
        sd_bus_message_open_container(message, 'e', "sa{sv}");
        sd_bus_message_append(message, "s", interface.c_str());
        sd_bus_message_open_container(message, 'a', "{sv}");
        for (const auto& [name, append] : properties) append(message);
        sd_bus_message_close_container(message);
        sd_bus_message_close_container(message);
    }
    sd_bus_message_close_container(message);
}

inline void appendObjects(sd_bus_message* message, const MockObjects& objects) {
    sd_bus_message_open_container(message, 'a', "{oa{sa{sv}}}");
    for (const auto& [path, interfaces] : objects) {
        sd_bus_message_open_container(message, 'e', "oa{sa{sv}}");
        appendObject(message, path, interfaces);
        sd_bus_message_close_container(message);
    }
    sd_bus_message_close_container(message);
}

// Answers what is asked of its objects, as one that has those names.
class MockService {
public:
    // Writes its arguments into the reply; an error's name refuses.
    using Method = std::function<std::optional<std::string>(sd_bus_message* call, sd_bus_message* reply)>;

    MockService(sd_event* loop, const MockBus& bus) {
        sd_bus_new(&bus_);
        sd_bus_set_address(bus_, bus.address().c_str());
        sd_bus_set_bus_client(bus_, 1);
        EXPECT_GE(sd_bus_start(bus_), 0);
        sd_bus_attach_event(bus_, loop, 0);
        sd_bus_add_filter(bus_, nullptr, onMessage, this);
    }
    ~MockService() {
        sd_bus_detach_event(bus_);
        sd_bus_close_unref(bus_);
    }
    MockService(const MockService&) = delete;
    MockService& operator=(const MockService&) = delete;

    void takeName(const char* name) { EXPECT_GE(sd_bus_request_name(bus_, name, 0), 0); }
    void leaveName(const char* name) { EXPECT_GE(sd_bus_release_name(bus_, name), 0); }
    // Of any of its objects, by "PATH MEMBER".
    std::map<std::string, Method> methods;
    int calls = 0;

    // Answers GetAll of that object with what is appended.
    void answerProperties(const std::string& path, std::function<void(sd_bus_message*)> append) {
        methods[path + " GetAll"] = [append](sd_bus_message*, sd_bus_message* reply) {
            sd_bus_message_open_container(reply, 'a', "{sv}");
            append(reply);
            sd_bus_message_close_container(reply);
            return std::nullopt;
        };
    }
    // Emits PropertiesChanged of one property, to one receiver or to all.
    template <class... Arguments>
    void emit(const std::string& path, const char* interface, const char* property, const char* type,
              Arguments... value) {
        emitTo(nullptr, path, interface, property, type, value...);
    }
    template <class... Arguments>
    void emitTo(const char* receiver, const std::string& path, const char* interface, const char* property,
                const char* type, Arguments... value) {
        emitSignal(receiver, path, "org.freedesktop.DBus.Properties", "PropertiesChanged", [&](sd_bus_message* signal) {
            sd_bus_message_append(signal, "s", interface);
            sd_bus_message_open_container(signal, 'a', "{sv}");
            if (property) appendProperty(signal, property, type, value...);
            sd_bus_message_close_container(signal);
            sd_bus_message_append(signal, "as", 0);
        });
    }
    // Emits that a property has changed, without its value.
    void invalidate(const std::string& path, const char* interface, const char* property) {
        emitSignal(nullptr, path, "org.freedesktop.DBus.Properties", "PropertiesChanged", [&](sd_bus_message* signal) {
            sd_bus_message_append(signal, "sa{sv}as", interface, 0, 1, property);
        });
    }
    // Emits any signal, to all where the receiver is null.
    void emitSignal(const char* receiver, const std::string& path, const char* interface, const char* member,
                    const std::function<void(sd_bus_message*)>& append) {
        sd_bus_message* signal = nullptr;
        sd_bus_message_new_signal(bus_, &signal, path.c_str(), interface, member);
        append(signal);
        if (receiver) sd_bus_message_set_destination(signal, receiver);
        EXPECT_GE(sd_bus_send(bus_, signal, nullptr), 0);
        sd_bus_message_unref(signal);
    }
    template <class... Arguments>
    static void appendProperty(sd_bus_message* message, const char* property, const char* type, Arguments... value) {
        EXPECT_GE(sd_bus_message_append(message, "{sv}", property, type, value...), 0);
    }

    // The same to every connection there can be so far; the bus has passed it on when this comes back.
    template <class... Arguments>
    void emitToEach(const std::string& path, const char* interface, const char* property, const char* type,
                    Arguments... value) {
        for (int i = 0; i < 50; ++i)
            emitTo((":1." + std::to_string(i)).c_str(), path, interface, property, type, value...);
        takeName("org.example.Done");
    }

private:
    static int onMessage(sd_bus_message* message, void* userdata, sd_bus_error*) {
        auto& self = *static_cast<MockService*>(userdata);
        if (sd_bus_message_is_method_call(message, nullptr, nullptr) <= 0) return 0;
        ++self.calls;
        const auto method =
            self.methods.find(std::string(sd_bus_message_get_path(message)) + " " + sd_bus_message_get_member(message));
        if (method == self.methods.end()) return 0;
        sd_bus_message* reply = nullptr;
        sd_bus_message_new_method_return(message, &reply);
        if (const auto error = method->second(message, reply))
            sd_bus_reply_method_errorf(message, error->c_str(), "no");
        else
            sd_bus_send(self.bus_, reply, nullptr);
        sd_bus_message_unref(reply);
        return 1;
    }

    sd_bus* bus_ = nullptr;
};

class BusTest : public InFolder {
protected:
    // Lets the loop run until that holds.
    template <class Condition>
    void runUntil(Condition condition, const char* what) {
        eventually(
            [&] {
                sd_event_run(loop.event(), 10'000);
                return condition();
            },
            what);
    }
    // A method that refuses, and one that answers one value.
    static MockService::Method refusal(std::string error) {
        return [error](sd_bus_message*, sd_bus_message*) { return std::optional(error); };
    }
    template <class Argument>
    static MockService::Method answer(const char* type, Argument value) {
        return [type, value](sd_bus_message*, sd_bus_message* reply) {
            sd_bus_message_append(reply, type, value);
            return std::nullopt;
        };
    }

    MainLoop loop;
    MockBus bus{folder.path()};
    SystemBus connection{loop.event(), bus.address()};
};

}  // namespace vrx::host
