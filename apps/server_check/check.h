// vrx-coverage-server check URL: asks a server as the agent would, and says what the agent would make of its answers.
// Its sources use the agent's layers. The server's own do not, so that it judges the agent's requests independently;
// this header is all that they see.
#pragma once

#include <CLI/CLI.hpp>
#include <optional>
#include <string>

namespace vrx::server_check {

struct CheckOptions {
    std::string url;                                // what WarrantyURL would be
    std::optional<std::string> serverVersionUrl{};  // what ServerVersionURL would be; null: it is not asked
    std::string serialNumber = "VRXPHONE0001";
    std::optional<std::string> token{};
    std::optional<std::string> profile{};
    std::optional<std::string> caFile{};
    double seconds = 120;
};

inline constexpr const char* checkHelp =
    "Asks a coverage server as the agent would, and says what the agent would make of its answers; must be the first "
    "word";

void addCheckOptions(CLI::App& verb, CheckOptions& options);

// The whole program, once its first argument is the verb. Returns its exit code.
int runCheck(int argc, const char* const* argv);

}  // namespace vrx::server_check
