// A program's manual page and its shells' completions, made from the options and verbs that it parses: what is
// installed beside a program says what the program does.
#pragma once

#include <CLI/CLI.hpp>
#include <string>

namespace vrx::apps {

enum class ManualForm { Man, Bash, Zsh, Fish };

// The text of the file in that form. The app's name is the program's.
std::string manual(const CLI::App& app, ManualForm form);

// Adds the hidden option by which the build has a program write one: --manual man|bash|zsh|fish prints it and ends the
// program, by CLI::Success.
void addManualOption(CLI::App& app);

}  // namespace vrx::apps
