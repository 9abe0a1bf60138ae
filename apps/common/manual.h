// A program's manual page and shell completions, made from the options and verbs that it parses, so that they always
// match the program.
#pragma once

#include <CLI/CLI.hpp>
#include <string>

namespace vrx::apps {

enum class ManualForm { Man, Bash, Zsh, Fish };

// The text of the file in that form. The app's name is the program's.
std::string manual(const CLI::App& app, ManualForm form);

// Adds the hidden option --manual man|bash|zsh|fish, by which the build has a program print its manual. It ends the
// program by CLI::Success.
void addManualOption(CLI::App& app);

}  // namespace vrx::apps
