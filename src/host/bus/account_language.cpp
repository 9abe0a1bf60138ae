#include "vrx/host/bus/account_language.h"

#include <utility>

#include "vrx/host/base/text.h"

namespace vrx::host {

namespace {

constexpr const char* accounts = "org.freedesktop.Accounts";
constexpr const char* accountsPath = "/org/freedesktop/Accounts";
constexpr const char* accountInterface = "org.freedesktop.Accounts.User";
constexpr std::uint32_t firstPerson = 1000;

const std::vector<BusProperty>& accountProperties() {
    static const std::vector<BusProperty> properties = {{"Language", "s"}};
    return properties;
}

}  // namespace

AccountLanguage::AccountLanguage(SystemBus& bus, std::uint32_t user, std::optional<std::string> kept,
                                 IdentifierOf identifierOf, std::function<void()> onChange, platform::Duration pause)
    : BusService(bus, accounts, user < firstPerson ? Activation::Never : Activation::ByQuestion),
      user_(user),
      identifierOf_(std::move(identifierOf)),
      onChange_(std::move(onChange)),
      pause_(pause),
      isSettled_(user < firstPerson),
      identifier_(std::move(kept)) {}

std::optional<std::string> AccountLanguage::value() const {
    const std::lock_guard lock(mutex_);
    return identifier_;
}

bool AccountLanguage::isSettled() const {
    const std::lock_guard lock(mutex_);
    return isSettled_;
}

void AccountLanguage::ask() {
    if (user_ < firstPerson) return;
    call(
        accountsPath, accounts, "FindUserById", [this](sd_bus_message* reply) { found(reply); },
        [this](sd_bus_message* message) { return sd_bus_message_append_basic(message, 'x', &user_); });
}

void AccountLanguage::left() {
    settle(value());
}

void AccountLanguage::found(sd_bus_message* reply) {
    const char* path = nullptr;
    if (!reply || sd_bus_message_has_signature(reply, "o") <= 0 || sd_bus_message_read_basic(reply, 'o', &path) <= 0) {
        answered();
        return settle(value());
    }
    matchInstead({changedPropertiesRule("path='" + std::string(path) + "'", accountInterface)},
                 [this](sd_bus_message* signal) { takeChange(signal); });
    call(path, propertiesInterface, "GetAll", [this](sd_bus_message* answer) { takeAll(answer); }, {accountInterface});
}

void AccountLanguage::takeAll(sd_bus_message* reply) {
    answered();
    BusValues values;
    if (readAllProperties(reply, accountProperties(), values)) take(values);
    settle(value());
}

void AccountLanguage::takeChange(sd_bus_message* signal) {
    BusValues values;
    std::vector<std::string> toBeAsked;
    if (!readChangedProperties(signal, accountInterface, accountProperties(), values, toBeAsked)) return;
    take(values);
    if (!toBeAsked.empty()) askAgainLater(pause_);
}

void AccountLanguage::take(const BusValues& values) {
    const auto language = values.find("Language");
    const std::string* name = language == values.end() ? nullptr : language->second.asString();
    if (name && isOneLine(*name)) settle(name->empty() ? std::nullopt : identifierOf_(*name));
}

void AccountLanguage::settle(std::optional<std::string> identifier) {
    {
        const std::lock_guard lock(mutex_);
        if (std::exchange(isSettled_, true) && identifier == identifier_) return;
        identifier_ = std::move(identifier);
    }
    onChange_();
}

}  // namespace vrx::host
