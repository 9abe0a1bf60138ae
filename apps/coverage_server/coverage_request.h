// Judges a signed coverage request: a pure function of the request, the valid tokens and the required headers.
#pragma once

#include <httplib.h>

#include <string>
#include <string_view>
#include <vector>

#include "coverage_server/tokens.h"

namespace vrx::coverage_server {

inline constexpr std::string_view tokenHeader = "X-Orvane-KS-Token";

// The account session's headers. NAME* demands at least one header that begins with NAME.
inline const std::vector<std::string> defaultRequiredHeaders = {"X-Orvane-Client-Info", "X-Orvane-Device-Id",
                                                                "X-Orvane-Account-*"};

struct Verdict {
    int status = 200;                  // 401 when the token is missing or not valid, 400 for any other reason
    std::vector<std::string> reasons;  // all of them
    std::string serialNumber;          // only when the status is 200
};

Verdict judge(const httplib::Request& request, const Tokens& tokens, const std::vector<std::string>& requiredHeaders);

}  // namespace vrx::coverage_server
