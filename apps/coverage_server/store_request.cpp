#include "coverage_server/store_request.h"

#include <algorithm>
#include <charconv>

namespace vrx::coverage_server {

namespace {

using Reasons = std::vector<std::string>;

// The parameter's values. Adds a reason for each empty one.
std::vector<std::string> valuesOf(const httplib::Request& request, const std::string& name, Reasons& reasons) {
    std::vector<std::string> values;
    const auto [begin, end] = request.params.equal_range(name);
    for (auto parameter = begin; parameter != end; ++parameter) {
        if (parameter->second.empty()) reasons.push_back("parameter " + name + " is empty");
        values.push_back(parameter->second);
    }
    return values;
}

// The parameter's value, if it is there exactly once and not empty; else adds a reason.
std::string soleValue(const httplib::Request& request, const std::string& name, Reasons& reasons) {
    const std::vector<std::string> values = valuesOf(request, name, reasons);
    if (values.empty()) reasons.push_back("parameter " + name + " is missing");
    if (values.size() > 1) reasons.push_back("parameter " + name + " is there more than once");
    return values.size() == 1 ? values.front() : "";
}

StoreQuestion questionForBundles(const httplib::Request& request) {
    StoreQuestion question;
    question.bundles = valuesOf(request, "bundle", question.reasons);
    if (question.bundles.empty()) question.reasons.emplace_back("parameter bundle is missing");
    return question;
}

}  // namespace

StoreQuestion catalogueQuestion(const httplib::Request& request) {
    StoreQuestion question = questionForBundles(request);
    Reasons& reasons = question.reasons;
    question.items = valuesOf(request, "item", reasons);
    const std::string profile = soleValue(request, "profile", reasons);
    if (!profile.empty() && profile != "lockup") reasons.emplace_back("parameter profile is not lockup");
    const std::string caller = soleValue(request, "caller", reasons);
    if (!caller.empty() && std::ranges::find(question.bundles, caller) == question.bundles.end())
        reasons.emplace_back("parameter caller is none of the bundles");
    soleValue(request, "locale", reasons);
    return question;
}

StoreQuestion purchasesQuestion(const httplib::Request& request) {
    StoreQuestion question = questionForBundles(request);
    const std::string account = soleValue(request, "account", question.reasons);
    const auto [end, error] = std::from_chars(account.data(), account.data() + account.size(), question.account);
    if (!account.empty() && (error != std::errc() || end != account.data() + account.size()))
        question.reasons.emplace_back("parameter account is no whole number of 64 bits");
    return question;
}

}  // namespace vrx::coverage_server
