// The names of the defects that can be planted in the simulated host.
#pragma once

#include <optional>
#include <span>
#include <string_view>

#include "vrx/sim/interference.h"

namespace vrx::simulation {

struct NamedDefect {
    std::string_view name;
    sim::Defect defect;
};

inline std::span<const NamedDefect> namedDefects() {
    using enum sim::Defect;
    static constexpr NamedDefect all[] = {
        {"setting-lost", SettingLost},
        {"setting-stale", SettingStale},
        {"setting-forgotten", SettingForgotten},
        {"post-lost", PostLost},
        {"clear-lost", ClearLost},
        {"item-doubled", ItemDoubled},
        {"file-torn", FileTorn},
        {"firing-lost", FiringLost},
        {"firing-late", FiringLate},
        {"firing-early", FiringEarly},
        {"firing-again", FiringAgain},
        {"handler-twice", HandlerTwice},
        {"row-forgotten", RowForgotten},
        {"clock-not-carried", ClockNotCarried},
        {"reply-dropped", ReplyDropped},
        {"answer-lost", AnswerLost},
        {"notification-lost", NotificationLost},
    };
    return all;
}

// Null for any other name.
inline std::optional<sim::Defect> defectFrom(std::string_view name) {
    for (const NamedDefect& known : namedDefects())
        if (known.name == name) return known.defect;
    return std::nullopt;
}

}  // namespace vrx::simulation
