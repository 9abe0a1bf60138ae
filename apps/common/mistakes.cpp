#include "common/mistakes.h"

#include <algorithm>
#include <cstdio>
#include <numeric>
#include <utility>

namespace vrx::apps {

namespace {

// How many letters have to be inserted, removed or replaced.
std::size_t distanceBetween(std::string_view one, std::string_view other) {
    std::vector<std::size_t> row(other.size() + 1);
    std::iota(row.begin(), row.end(), std::size_t{0});
    for (std::size_t i = 1; i <= one.size(); ++i) {
        std::size_t before = std::exchange(row[0], i);
        for (std::size_t j = 1; j <= other.size(); ++j) {
            const std::size_t replaced = before + (one[i - 1] != other[j - 1] ? 1 : 0);
            before = std::exchange(row[j], std::min({row[j] + 1, row[j - 1] + 1, replaced}));
        }
    }
    return row.back();
}

const CLI::App& lastVerb(const CLI::App& app) {
    const CLI::App* verb = &app;
    while (!verb->get_subcommands().empty()) verb = verb->get_subcommands().back();
    return *verb;
}

std::vector<std::string> verbsBelow(const CLI::App& verb) {
    std::vector<std::string> names;
    for (const CLI::App* inner : verb.get_subcommands([](const CLI::App*) { return true; }))
        if (!inner->get_name().empty()) names.push_back(inner->get_name());
    return names;
}

// Also those of the verbs above it, which may stand anywhere, and of its groups.
void addOptions(const CLI::App& app, std::vector<std::string>& names) {
    for (const CLI::Option* option : app.get_options())
        if (!option->get_group().empty())
            for (const std::string& name : option->get_lnames()) names.push_back("--" + name);
    for (const CLI::App* group : app.get_subcommands([](const CLI::App* inner) { return inner->get_name().empty(); }))
        addOptions(*group, names);
}

std::string pathOf(const CLI::App& verb) {
    return verb.get_parent() ? pathOf(*verb.get_parent()) + " " + verb.get_name() : verb.get_name();
}

std::string listed(const std::vector<std::string>& words) {
    std::string text;
    for (const std::string& word : words) text += (text.empty() ? "" : ", ") + word;
    return text;
}

std::string unknown(const char* what, const std::string& word, const std::vector<std::string>& words) {
    const std::string nearest = nearestWord(word, words);
    return std::string("there is no ") + what + " " + word + (nearest.empty() ? "" : "; did you mean " + nearest + "?");
}

}  // namespace

std::string nearestWord(std::string_view word, const std::vector<std::string>& words) {
    std::string nearest;
    std::size_t least = std::max<std::size_t>(2, word.size() / 3) + 1;
    for (const std::string& candidate : words) {
        std::size_t distance = distanceBetween(word, candidate);
        // Or it was left off in the midst.
        if (word.size() > 2 && !word.starts_with('-'))
            for (const std::size_t size : {word.size(), word.size() + 1})
                distance = std::min(distance, distanceBetween(word, candidate.substr(0, size)) + 1);
        if (distance >= std::min(least, candidate.size())) continue;
        least = distance;
        nearest = candidate;
    }
    return nearest;
}

Mistake explainMistake(const CLI::App& app, const CLI::ParseError& error) {
    const CLI::App& verb = lastVerb(app);
    Mistake mistake{error.what(), "See " + pathOf(verb) + " --help."};
    const bool isAboutWords =
        dynamic_cast<const CLI::ExtrasError*>(&error) || dynamic_cast<const CLI::RequiredError*>(&error);
    if (!isAboutWords) return mistake;
    const std::vector<std::string> rest = app.remaining(true), verbs = verbsBelow(verb);
    const auto option = std::ranges::find_if(rest, [](const std::string& word) { return word.starts_with('-'); });
    if (option != rest.end()) {
        std::vector<std::string> options;
        for (const CLI::App* above = &verb; above; above = above->get_parent()) addOptions(*above, options);
        mistake.problem = unknown("option", option->substr(0, option->find('=')), options);
    } else if (!rest.empty() && !verbs.empty()) {
        mistake.problem = unknown("verb", rest.front(), verbs);
    } else if (!rest.empty()) {
        mistake.problem = verb.get_name() + " takes no further argument: " + rest.front();
    } else if (!verbs.empty() && verb.get_require_subcommand_min() > 0) {
        mistake.problem = "a verb is needed: " + listed(verbs);
    }
    return mistake;
}

int endOfParsing(const CLI::App& app, const CLI::ParseError& error) {
    if (error.get_exit_code() == 0) return app.exit(error);
    Mistake mistake = explainMistake(app, error);
    std::ranges::replace_if(
        mistake.problem, [](unsigned char c) { return c < 0x20 || c == 0x7f; }, '?');
    std::fprintf(stderr, "%s: %s\n%s\n", app.get_name().c_str(), mistake.problem.c_str(), mistake.advice.c_str());
    return 2;
}

}  // namespace vrx::apps
