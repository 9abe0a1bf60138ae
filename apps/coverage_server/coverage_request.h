// Judges a signed coverage request: a pure function of the request and of what is asked of it.
#pragma once

#include <httplib.h>

#include <string>
#include <string_view>
#include <vector>

#include "coverage_server/tokens.h"

namespace vrx::coverage_server {

inline constexpr std::string_view tokenHeader = "X-Orvane-KS-Token";

// The account session's headers. A name that ends in * stands for at least one header that begins so.
inline const std::vector<std::string> defaultRequiredHeaders = {"X-Orvane-Client-Info", "X-Orvane-Device-Id",
                                                                "X-Orvane-Account-*"};

struct Verdict {
    int status = 200;                  // else 400, or 401 when the token is missing or not valid
    std::vector<std::string> reasons;  // all of them
    std::string serialNumber;          // of a request that is right
};

Verdict judge(const httplib::Request& request, const Tokens& tokens, const std::vector<std::string>& requiredHeaders);

}  // namespace vrx::coverage_server
