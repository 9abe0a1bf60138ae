// All settings that the agent reads or stores, for those who write settings: what they are for, and which type is read.
// Any thread may ask.
#pragma once

#include <cstdint>
#include <span>
#include <string_view>

#include "vrx/platform/value.h"

namespace vrx::platform {

enum class SettingType : std::uint8_t { Text, Number, Flag, Date, List, Dictionary };

struct KnownSetting {
    enum class Purpose : std::uint8_t {
        Configuration,
        Test,
        State,  // written by the agent for itself
    };
    std::string_view name;
    SettingType type;
    Purpose purpose;
    std::string_view placeholder = "";  // at the name's beginning, for any text that is not empty
};

std::span<const KnownSetting> knownSettings();

// Null for a key that nothing reads.
const KnownSetting* findSetting(std::string_view key);

// "a string", "a number"
std::string_view describe(SettingType type);
// Whether it is exactly of that type.
bool isOfType(const Value& value, SettingType type);
// Whether a reader of that type makes something of it: numbers and flags are also read from texts.
bool isReadAs(const Value& value, SettingType type);

}  // namespace vrx::platform
