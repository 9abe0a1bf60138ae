// A program's manual page and shell completions, made from the options and verbs that it parses, so that they always
// match the program.
#pragma once

#include <CLI/CLI.hpp>
#include <functional>
#include <map>
#include <string>
#include <utility>
#include <vector>

namespace vrx::apps {

enum class ManualForm { Man, Bash, Zsh, Fish };

// What a program's options do not tell.
struct ManualNotes {
    using Lines = std::vector<std::pair<std::string, std::string>>;  // a word, and what it means

    Lines exitCodes{};
    Lines files{};
    Lines environment{};
    Lines examples{};                    // a command, and what it does
    std::vector<std::string> seeAlso{};  // such as "vrxctl(1)"
    // The words that completions offer for an argument, by its name in the help, such as SERIAL. Asked while the user
    // waits for it.
    std::map<std::string, std::function<std::vector<std::string>()>> words{};
};

// Where all programs find an agent, and what tells them.
ManualNotes::Lines agentFiles();
ManualNotes::Lines agentEnvironment();

// The text of the file in that form. The app's name is the program's.
std::string manual(const CLI::App& app, const ManualNotes& notes, ManualForm form);

// Adds the hidden options --manual man|bash|zsh|fish, by which the build has a program print its manual, and
// --candidates NAME, by which completions ask for words. They end the program by CLI::Success. The notes must outlive
// the app. Called after the other options are added: what asks for words may then use their values.
void addManualOption(CLI::App& app, const ManualNotes& notes);

}  // namespace vrx::apps
