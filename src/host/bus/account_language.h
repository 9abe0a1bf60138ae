// The language that a user has chosen for the desktop, as AccountsService (org.freedesktop.Accounts) keeps it. Owned by
// the host; main thread, but for what says otherwise.
#pragma once

#include <cstdint>
#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "vrx/host/bus/bus_properties.h"

namespace vrx::host {

class AccountLanguage final : public BusService {
public:
    // Makes the locale identifier of a POSIX locale name such as "de_DE.UTF-8", or nothing.
    using IdentifierOf = std::function<std::optional<std::string>(std::string_view name)>;

    // Asks for that user, and only where the user is a person: a system user (below 1000) has no language. What is kept
    // from an earlier process stays until the service has answered. Calls onChange, on the main thread, when it is
    // settled and when the language has changed. Asks again after the pause when it is to.
    AccountLanguage(SystemBus& bus, std::uint32_t user, std::optional<std::string> kept, IdentifierOf identifierOf,
                    std::function<void()> onChange, platform::Duration pause = pauseBeforeQuestion);

    // The locale identifier; nothing where none is chosen. While the service is silent it stays. Any thread.
    std::optional<std::string> value() const;
    // Whether the service has answered, or it is known that it does not. It may stay false for as long as the bus does
    // not answer, or is not there. Any thread.
    bool isSettled() const;

private:
    void follow() override {}
    void ask() override;
    void left() override;
    void found(sd_bus_message* reply);
    void takeAll(sd_bus_message* reply);
    void takeChange(sd_bus_message* signal);
    void take(const BusValues& values);
    void settle(std::optional<std::string> identifier);

    const std::int64_t user_;
    const IdentifierOf identifierOf_;
    const std::function<void()> onChange_;
    const platform::Duration pause_;
    mutable std::mutex mutex_;
    bool isSettled_;
    std::optional<std::string> identifier_;
};

}  // namespace vrx::host
