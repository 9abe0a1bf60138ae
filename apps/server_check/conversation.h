// A conversation with a server under check, led by the agent's own classes in a home that goes away: the version
// document, then a record with what signing it takes.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "server_check/check.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/platform/http_request.h"

namespace vrx::server_check {

struct Exchange {
    platform::HttpResponse response;
    platform::Date arrived{};
};

struct Conversation {
    bool isTimedOut = false;
    bool isStopped = false;  // by SIGINT or SIGTERM
    // Of the version document: null when it was not asked for, or not answered in time.
    std::vector<Exchange> versionExchanges;
    std::optional<bool> isServerVersionSupported;
    std::vector<std::string> versionErrors;
    platform::Value versions;  // that the agent goes by
    bool isHighVersionShared = false;
    // Of the record, the last attempt last. Asked for even where the versions keep the agent from it.
    std::vector<Exchange> coverageExchanges;
    std::vector<std::string> coverageErrors;
    std::shared_ptr<VRXWarranty> record;      // null: the agent has none
    std::shared_ptr<VRXWarranty> keptRecord;  // as the agent reads it back from its disk
};

// Calls with the conversation when it has ended, while the agent's classes can still be asked.
void converse(const CheckOptions& options, const std::function<void(const Conversation&)>& use);

}  // namespace vrx::server_check
