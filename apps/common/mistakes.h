// What is wrong with a program's arguments, in the words that all programs use. Any thread.
#pragma once

#include <CLI/CLI.hpp>
#include <string>
#include <string_view>
#include <vector>

namespace vrx::apps {

// The word that was most likely meant; empty when none is near.
std::string nearestWord(std::string_view word, const std::vector<std::string>& words);

struct Mistake {
    std::string problem;  // names the word that is wrong, and the nearest that is right
    std::string advice;
};

// After the app's parsing has ended with the error.
Mistake explainMistake(const CLI::App& app, const CLI::ParseError& error);

// Of a program without verbs: prints what the parsing ended with, as the other programs do. Returns the exit code: 0
// after --help and the like, else 2, for usage.
int endOfParsing(const CLI::App& app, const CLI::ParseError& error);

}  // namespace vrx::apps
