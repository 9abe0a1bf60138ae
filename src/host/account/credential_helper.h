// Asks a credential helper for a token: a program that the device profile names, asked the way version-control tools
// ask theirs. On its standard input it finds lines of key=value, ended by an empty one:
//
//     account=IDENTIFIER
//     altdsid=IDENTIFIER        (where the account has one)
//     service=IDENTIFIER
//     avoid_ui=1                (0 when it may ask the user)
//
// It answers with such lines: token=TOKEN, and others, which are ignored. It must end with status 0. What it says on
// its standard error goes to the log: the beginning as a private value and, at the debug level, up to 16 KiB readably;
// but no line that holds the token that it gave.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/host/base/secret.h"
#include "vrx/platform/date.h"
#include "vrx/platform/error.h"

namespace vrx::host {

struct CredentialQuestion {
    std::string account;
    std::optional<std::string> altDSID;
    std::string service;
    bool avoidsUI;
};

// Why a renewal failed: the code of its error and of its result.
enum class CredentialFailure { NotConfigured = 1, NotTrusted, NotStarted, TimedOut, Ended, Status, Answer, NotStored };
platform::Error credentialError(CredentialFailure failure, std::string text);

// Returns the token. Waits for the helper, which gets a process group of its own. The whole group is killed when the
// helper has answered, when the time is over, or when the stop file becomes readable.
platform::Result<Secret> askCredentialHelper(const std::vector<std::string>& command,
                                             const CredentialQuestion& question, platform::Duration limit,
                                             int stopFile);

// The token in a helper's output, or what is wrong with the output. The text of an error contains none of it.
platform::Result<std::string_view> tokenIn(std::string_view answer);

}  // namespace vrx::host
