#include "settings/notifier.h"

#include <algorithm>
#include <string_view>
#include <utility>

#include "settings/words.h"
#include "vrx/platform/utf8.h"

namespace vrx::settings {

using client::FollowUp;

namespace {

constexpr const char* server = "org.freedesktop.Notifications";
constexpr const char* serverPath = "/org/freedesktop/Notifications";
constexpr const char* page = "com.orvane.Coverage";
constexpr const char* pagePath = "/com/orvane/Coverage";
constexpr std::int64_t notificationStyle = 2;
constexpr std::uint32_t closedByUser = 2;

// The bus carries UTF-8 without NUL only.
std::string busText(const std::string& text) {
    std::string carried;
    for (std::string_view rest = text; !rest.empty();) {
        const std::string_view before = rest;
        const auto character = platform::takeCharacter(rest);
        if (!character) rest = before.substr(1);
        if (character && *character != 0) carried += before.substr(0, before.size() - rest.size());
    }
    return carried;
}

// Servers read a body as markup.
std::string bodyText(const std::string& text) {
    std::string escaped;
    for (const char c : busText(text)) {
        if (c == '&')
            escaped += "&amp;";
        else if (c == '<')
            escaped += "&lt;";
        else
            escaped += c;
    }
    return escaped;
}

bool wantsNotification(const FollowUp& followUp) {
    return (followUp.item["displayStyle"].asInteger().value_or(0) & notificationStyle) != 0 && followUp.title;
}

}  // namespace

// A call of Notify under way.
struct Notifier::Asked {
    Notifier* notifier;
    std::string identifier;
    Slot slot{nullptr, sd_bus_slot_unref};
};

Notifier::Notifier(sd_bus* bus, Remembered remembered) : bus_(bus), remembered_(std::move(remembered)) {
    listen(server, serverPath, server, nullptr);
    listen("org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus", "NameOwnerChanged");
}

Notifier::~Notifier() = default;

void Notifier::listen(const char* sender, const char* path, const char* interface, const char* member) {
    sd_bus_slot* slot = nullptr;
    const auto take = [](sd_bus_message* message, void* self, sd_bus_error*) {
        static_cast<Notifier*>(self)->takeSignal(message);
        return 0;
    };
    if (sd_bus_match_signal_async(bus_, &slot, sender, path, interface, member, take, nullptr, this) >= 0)
        slots_.emplace_back(slot, sd_bus_slot_unref);
}

void Notifier::show(const std::vector<FollowUp>& followUps) {
    wanted_.clear();
    for (const FollowUp& followUp : followUps) {
        if (!wantsNotification(followUp)) continue;
        const std::string title = busText(*followUp.title);
        if (remembered_.contains(followUp.identifier, title)) continue;
        std::string action = tr("Show");
        if (!followUp.actions.empty()) action = followUp.actions.front().label.value_or(action);
        wanted_.emplace(followUp.identifier, Wanted{title, bodyText(followUp.deviceName.value_or("")), busText(action),
                                                    busText(followUp.serialNumber.value_or(""))});
    }
    bringInStep();
}

void Notifier::takeBack() {
    wanted_.clear();
    bringInStep();
}

// What is asked of the server already is looked at again with its answer.
void Notifier::bringInStep() {
    std::erase_if(notifications_, [this](const auto& entry) {
        const auto& [identifier, notification] = entry;
        if (notification.isAsked || wanted_.contains(identifier)) return false;
        if (notification.number != 0) close(notification.number);
        return true;
    });
    for (const auto& [identifier, wanted] : wanted_) {
        const Notification& notification = notifications_[identifier];
        const bool isNews = notification.content.title != wanted.title;
        if (!notification.isAsked && (isNews || (notification.number == 0 && !notification.isOver)))
            notify(identifier, wanted);
    }
}

void Notifier::notify(const std::string& identifier, const Wanted& wanted) {
    Notification& notification = notifications_[identifier];
    sd_bus_message* message = nullptr;
    auto asked = std::make_unique<Asked>(Asked{this, identifier});
    const auto take = [](sd_bus_message* reply, void* data, sd_bus_error*) {
        const auto* call = static_cast<const Asked*>(data);
        call->notifier->answered(std::string(call->identifier), reply);
        return 0;
    };
    sd_bus_slot* slot = nullptr;
    int code = sd_bus_message_new_method_call(bus_, &message, server, serverPath, server, "Notify");
    if (code >= 0)
        code = sd_bus_message_append(message, "susssasa{sv}i", tr("Coverage"), notification.number, page,
                                     wanted.title.c_str(), wanted.body.c_str(), 4, "default", "", "show",
                                     wanted.action.c_str(), 2, "desktop-entry", "s", page, "urgency", "y", 1, -1);
    if (code >= 0) code = sd_bus_call_async(bus_, &slot, message, take, asked.get(), 0);
    sd_bus_message_unref(message);
    notification.content = wanted;
    notification.isOver = code < 0;
    notification.isAsked = code >= 0;
    if (code < 0) return;
    asked->slot.reset(slot);
    asked_.push_back(std::move(asked));
}

void Notifier::close(std::uint32_t number) {
    sd_bus_call_method_async(bus_, nullptr, server, serverPath, server, "CloseNotification", nullptr, nullptr, "u",
                             number);
}

// Where no server answers, the next one that comes is asked.
void Notifier::answered(const std::string& identifier, sd_bus_message* reply) {
    Notification& notification = notifications_[identifier];
    notification.isAsked = false;
    if (sd_bus_message_is_method_error(reply, nullptr) || sd_bus_message_read(reply, "u", &notification.number) < 0) {
        notification.number = 0;
        notification.isOver = true;
    }
    std::erase_if(asked_, [&](const auto& asked) { return asked->identifier == identifier; });
    bringInStep();
}

void Notifier::takeSignal(sd_bus_message* message) {
    const std::string_view member(sd_bus_message_get_member(message));
    if (member == "NotificationClosed") takeClosed(message);
    if (member == "ActionInvoked") takeAction(message);
    if (member == "ActivationToken") takeToken(message);
    if (member == "NameOwnerChanged") takeOwner(message);
}

void Notifier::takeClosed(sd_bus_message* message) {
    std::uint32_t number = 0, reason = 0;
    if (sd_bus_message_read(message, "uu", &number, &reason) < 0) return;
    const auto entry = withNumber(number);
    if (entry == notifications_.end()) return;
    entry->second.number = 0;
    entry->second.isOver = true;
    if (reason == closedByUser) remembered_.add(entry->first, entry->second.content.title);
}

void Notifier::takeAction(sd_bus_message* message) {
    std::uint32_t number = 0;
    if (sd_bus_message_read(message, "u", &number) < 0) return;
    const auto entry = withNumber(number);
    if (entry == notifications_.end()) return;
    openPage(entry->second.content.serialNumber);
    remembered_.add(entry->first, entry->second.content.title);
    entry->second.number = 0;
    entry->second.isOver = true;
    close(number);
}

void Notifier::takeToken(sd_bus_message* message) {
    std::uint32_t number = 0;
    const char* token = nullptr;
    if (sd_bus_message_read(message, "us", &number, &token) >= 0 && withNumber(number) != notifications_.end())
        token_ = token;
}

// A new server has none of the old one's notifications.
void Notifier::takeOwner(sd_bus_message* message) {
    const char *name = nullptr, *before = nullptr, *now = nullptr;
    if (sd_bus_message_read(message, "sss", &name, &before, &now) < 0) return;
    if (std::string_view(name) != server || *now == '\0') return;
    for (auto& [identifier, notification] : notifications_) {
        const bool isClosed = notification.isOver && remembered_.contains(identifier, notification.content.title);
        notification.number = 0;
        notification.isOver = isClosed;
    }
    bringInStep();
}

// The bus starts the page where it does not run.
void Notifier::openPage(const std::string& serialNumber) {
    const std::string token = std::exchange(token_, "");
    const char* tokenName = "activation-token";
    const char* application = "org.freedesktop.Application";
    const unsigned tokens = token.empty() ? 0 : 1;
    if (serialNumber.empty())
        sd_bus_call_method_async(bus_, nullptr, page, pagePath, application, "Activate", nullptr, nullptr, "a{sv}",
                                 tokens, tokenName, "s", token.c_str());
    else
        sd_bus_call_method_async(bus_, nullptr, page, pagePath, application, "ActivateAction", nullptr, nullptr,
                                 "sava{sv}", "show", 1, "s", serialNumber.c_str(), tokens, tokenName, "s",
                                 token.c_str());
}

std::map<std::string, Notifier::Notification>::iterator Notifier::withNumber(std::uint32_t number) {
    return std::ranges::find_if(notifications_,
                                [number](const auto& entry) { return number != 0 && entry.second.number == number; });
}

}  // namespace vrx::settings
