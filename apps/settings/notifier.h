// Shows a notification on the desktop for each follow-up that wants one, and opens the page at its device when it is
// pressed. One notification for an identifier and a title: a text that only counts days further is no news. A
// notification goes with its follow-up; one that the user has closed does not come back, not after a login either.
//
// Speaks org.freedesktop.Notifications on the session bus, and waits for none of its answers. One thread: the bus's.
#pragma once

#include <systemd/sd-bus.h>

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "settings/remembered.h"
#include "vrx/client/follow_ups.h"

namespace vrx::settings {

class Notifier final {
public:
    // The bus must outlive it.
    Notifier(sd_bus* bus, Remembered remembered);
    ~Notifier();
    Notifier(const Notifier&) = delete;
    Notifier& operator=(const Notifier&) = delete;

    // What is pending now.
    void show(const std::vector<client::FollowUp>& followUps);
    // Takes all notifications back.
    void takeBack();

private:
    struct Wanted {
        std::string title, body, action, serialNumber;
    };
    struct Notification {
        Wanted content{};
        std::uint32_t number = 0;  // the server's; 0 for none
        bool isAsked = false;      // until the server's answer
        bool isOver = false;       // closed, or not to be had
    };
    struct Asked;
    using Slot = std::unique_ptr<sd_bus_slot, decltype(&sd_bus_slot_unref)>;
    using Handler = void (Notifier::*)(sd_bus_message*);

    void listen(const char* sender, const char* path, const char* interface, const char* member);
    void bringInStep();
    void notify(const std::string& identifier, const Wanted& wanted);
    void close(std::uint32_t number);
    void answered(const std::string& identifier, sd_bus_message* reply);
    void takeSignal(sd_bus_message* message);
    void takeClosed(sd_bus_message* message);
    void takeAction(sd_bus_message* message);
    void takeToken(sd_bus_message* message);
    void takeOwner(sd_bus_message* message);
    void openPage(const std::string& serialNumber);
    std::map<std::string, Notification>::iterator withNumber(std::uint32_t number);

    sd_bus* const bus_;
    Remembered remembered_;
    std::map<std::string, Wanted> wanted_;
    std::map<std::string, Notification> notifications_;  // by the follow-up's identifier
    std::string token_;                                  // lets the page come to the front
    std::vector<Slot> slots_;
    std::vector<std::unique_ptr<Asked>> asked_;
};

}  // namespace vrx::settings
