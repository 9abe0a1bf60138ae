#include "vrxsim/life.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <limits>
#include <optional>
#include <sstream>

namespace vrx::simulation {

using platform::Error;
using platform::Result;

namespace {

constexpr std::int64_t mostDays = 4000;

// The verbs with what their words are: t a text, n a number, i a whole number of at least 0, - a number or "-".
struct Verb {
    std::string_view name;
    std::string_view words;
};
constexpr Verb verbs[] = {
    {"record", "t---nt"},  // serial number, shown from day, until day, days before the end, offer, excluded carrier
    {"no-record", "t"},
    {"pair", "t-"},
    {"unpair", "t"},
    {"language", "t"},
    {"zone", "n"},
    {"carrier", "t"},
    {"account", "t"},  // in, out
    {"flag", "t"},     // on, off
    {"versions", "ii"},
    {"internal", "t"},
    {"number", "tn"},
    {"text", "tt"},
    {"pairs", "ttt"},
    {"forget", "t"},
    {"network", "t"},
    {"metered", "t"},
    {"deferral", "t"},
    {"reboot", "i"},
    {"kill", "i"},
    {"kill-after-work", "ii"},
    {"kill-before-call", "ii"},
    {"upgrade", ""},
    {"clock", "n"},
    {"server", "ti"},
    {"versions-server", "ti"},
    {"outage", "t"},  // of the coverage server: what it answers, or over
    {"renewal", "ti"},
    {"fail", "ti"},
    {"power-cut-in-write", ""},
    {"old-layout", "n"},
    {"ask", "itti"},  // connection, operation, serial number, policy
    {"dismiss", "t"},
    {"disconnect", "i"},
    {"take-back", ""},
};

std::optional<double> number(std::string_view word) {
    double value = 0;
    const auto [end, error] = std::from_chars(word.data(), word.data() + word.size(), value);
    const bool isNumber = error == std::errc() && end == word.data() + word.size() && std::abs(value) < 1e9;
    return isNumber ? std::optional(value) : std::nullopt;
}

bool fits(std::string_view word, char kind) {
    const std::optional<double> value = number(word);
    switch (kind) {
        case 'n': return value.has_value();
        case 'i': return value && *value >= 0 && *value == std::floor(*value);
        case '-': return value || word == "-";
        default: return true;
    }
}

bool isAdmitted(const Event& event) {
    const auto* verb = std::ranges::find(verbs, event.verb, &Verb::name);
    if (verb == std::end(verbs) || verb->words.size() != event.words.size()) return false;
    return std::ranges::equal(event.words, verb->words, fits);
}

std::vector<std::string> wordsOf(const std::string& line) {
    std::istringstream stream(line);
    std::vector<std::string> words;
    for (std::string word; stream >> word;) words.push_back(word);
    return words;
}

std::optional<Event> eventFrom(std::vector<std::string> words, double day) {
    if (words.empty()) return std::nullopt;
    Event event{std::llround(day * secondsOfDay), words.front()};
    event.words.assign(words.begin() + 1, words.end());
    return isAdmitted(event) ? std::optional(std::move(event)) : std::nullopt;
}

std::uint64_t seedFrom(std::string_view word) {
    std::uint64_t seed = 0;
    std::from_chars(word.data(), word.data() + word.size(), seed);
    return seed;
}

bool takeHead(Life& life, const std::vector<std::string>& words) {
    if (words.size() == 2 && words[0] == "life") {
        const std::optional<double> days = number(words[1]);
        if (!days || *days < 1 || *days > mostDays || *days != std::floor(*days)) return false;
        life.days = static_cast<std::int64_t>(*days);
        return true;
    }
    const std::optional<Trouble> level = words.size() == 3 && words[0] == "seed" ? troubleFrom(words[2]) : std::nullopt;
    if (!level) return false;
    life.seed = seedFrom(words[1]);
    life.level = *level;
    return true;
}

bool takeLine(Life& life, const std::string& line) {
    if (line.starts_with('#')) {
        life.notes.push_back(line.substr(std::min<std::size_t>(2, line.size())));
        return true;
    }
    std::vector<std::string> words = wordsOf(line);
    if (words.empty() || takeHead(life, words)) return true;
    const bool isDated = words.size() >= 2 && words[0] == "day";
    const std::optional<double> day = isDated ? number(words[1]) : 0;
    if (!day || *day < 0) return false;
    if (isDated) words.erase(words.begin(), words.begin() + 2);
    std::optional<Event> event = eventFrom(std::move(words), *day);
    if (!event) return false;
    (isDated ? life.events : life.beginning).push_back(*std::move(event));
    return true;
}

}  // namespace

std::string_view describe(Trouble level) {
    constexpr std::string_view names[] = {"calm", "rough", "wild"};
    return names[static_cast<int>(level)];
}

std::optional<Trouble> troubleFrom(std::string_view word) {
    for (const Trouble level : {Trouble::Calm, Trouble::Rough, Trouble::Wild})
        if (word == describe(level)) return level;
    return std::nullopt;
}

double numberFrom(std::string_view word) {
    return number(word).value_or(std::numeric_limits<double>::quiet_NaN());
}

std::string wordFor(double number) {
    std::array<char, 400> text;
    std::snprintf(text.data(), text.size(), "%.5f", number);
    std::string word = text.data();
    word.erase(word.find_last_not_of('0') + 1);
    if (word.ends_with('.')) word.pop_back();
    return word == "-0" ? "0" : word;
}

// Five digits tell the second.
std::string textOf(const Event& event) {
    std::string line = "day " + wordFor(static_cast<double>(event.second) / secondsOfDay) + " " + event.verb;
    for (const std::string& word : event.words) line += " " + word;
    return line;
}

std::string textOf(const Life& life) {
    std::string text;
    for (const std::string& note : life.notes) text += "# " + note + "\n";
    text += "life " + std::to_string(life.days) + "\nseed " + std::to_string(life.seed) + " ";
    text.append(describe(life.level)).append("\n");
    for (const Event& event : life.beginning) {
        text += event.verb;
        for (const std::string& word : event.words) text += " " + word;
        text += "\n";
    }
    for (const Event& event : life.events) text += textOf(event) + "\n";
    return text;
}

Result<Life> lifeFrom(std::string_view text) {
    Life life;
    std::istringstream lines{std::string(text)};
    int count = 1;
    for (std::string line; std::getline(lines, line); ++count)
        if (!takeLine(life, line))
            return Error{platform::error_domain::system, 0,
                         "line " + std::to_string(count) + " is no part of a life: " + line};
    std::ranges::stable_sort(life.events, {}, &Event::second);
    return life;
}

}  // namespace vrx::simulation
