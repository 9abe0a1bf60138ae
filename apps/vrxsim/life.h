// A life of the agent: what is there at the beginning, and what happens when. It is made from a seed or read from a
// text, and the same life always plays the same way. Its text:
//
//     # what it is about
//     life 60                            days
//     seed 17 rough                      where it came from; without meaning for the play
//     pair WATCH1 -30                    what is there at the beginning
//     day 2.5 reboot 60                  what happens
//     day 4 server 401 3
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/platform/error.h"

namespace vrx::simulation {

inline constexpr double secondsOfDay = 86400;
inline constexpr double secondsOfHour = 3600;

enum class Trouble : std::uint8_t { Calm, Rough, Wild };

std::string_view describe(Trouble level);
// Null for any other word.
std::optional<Trouble> troubleFrom(std::string_view word);

struct Event {
    std::int64_t second = 0;  // since the beginning
    std::string verb;
    std::vector<std::string> words{};

    bool operator==(const Event&) const = default;
};

struct Life {
    std::vector<std::string> notes{};  // the comments at its head
    std::uint64_t seed = 0;
    Trouble level = Trouble::Calm;
    std::int64_t days = 1;
    std::vector<Event> beginning{};  // all at second 0, before the first start
    std::vector<Event> events{};     // by their seconds

    bool operator==(const Life&) const = default;
};

std::string textOf(const Life& life);
// One line of it.
std::string textOf(const Event& event);
// The error names the line.
platform::Result<Life> lifeFrom(std::string_view text);

// What a word says; the words of a life that was read are admitted for their verb.
double numberFrom(std::string_view word);
// A number without needless digits.
std::string wordFor(double number);

}  // namespace vrx::simulation
