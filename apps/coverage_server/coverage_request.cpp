#include "coverage_server/coverage_request.h"

#include <strings.h>

#include <algorithm>

#include "coverage_server/json.h"

namespace vrx::coverage_server {

namespace {

using Reasons = std::vector<std::string>;

// The header's value, if it is there exactly once and not empty; else adds a reason and returns an empty text.
std::string soleHeader(const httplib::Request& request, const std::string& name, Reasons& reasons) {
    const std::size_t count = request.get_header_value_count(name);
    std::string value = count == 1 ? request.get_header_value(name) : "";
    if (count == 0)
        reasons.push_back("header " + name + " is missing");
    else if (count > 1)
        reasons.push_back("header " + name + " is there more than once");
    else if (value.empty())
        reasons.push_back("header " + name + " is empty");
    return value;
}

void judgeRequired(const httplib::Request& request, const std::string& name, Reasons& reasons) {
    if (!name.ends_with('*')) {
        soleHeader(request, name, reasons);
        return;
    }
    const std::string prefix = name.substr(0, name.size() - 1);
    const bool isThere = std::ranges::any_of(request.headers, [&](const auto& header) {
        return strncasecmp(header.first.c_str(), prefix.c_str(), prefix.size()) == 0 && !header.second.empty();
    });
    if (!isThere) reasons.push_back("no header begins with " + prefix);
}

// "<identifier/version/type>", with three parts that are not empty.
bool isUserAgent(std::string_view text) {
    if (text.size() < 7 || !text.starts_with('<') || !text.ends_with('>')) return false;
    text = text.substr(1, text.size() - 2);
    return std::ranges::count(text, '/') == 2 && !text.starts_with('/') && !text.ends_with('/') &&
           text.find("//") == text.npos && text.find_first_of("<>") == text.npos;
}

void judgeBody(const std::string& body, Verdict& verdict) {
    const Json json = Json::parse(body, nullptr, false);
    if (json.is_discarded()) return verdict.reasons.push_back("the body is not JSON");
    if (!json.is_object()) return verdict.reasons.push_back("the body is not an object");
    auto expect = [&](const char* name, auto isRight, const char* what) {
        if (!json.contains(name))
            verdict.reasons.push_back("member " + std::string(name) + " is missing");
        else if (!isRight(json[name]))
            verdict.reasons.push_back("member " + std::string(name) + " is not " + what);
    };
    auto isText = [](const Json& value) { return value.is_string() && !value.get_ref<const std::string&>().empty(); };
    expect("serialNumber", isText, "a string that is not empty");
    expect("locale", isText, "a string that is not empty");
    expect(
        "requestTimestamp",
        [](const Json& value) {
            constexpr std::uint64_t year2001 = 1'000'000'000'000;  // a smaller number counts seconds
            return value.is_number_unsigned() && value.get<std::uint64_t>() >= year2001;
        },
        "an unsigned integer, in milliseconds since 1970");
    expect(
        "requestTimezone",
        [](const Json& value) {
            return value.is_number_integer() && value.get<double>() >= -24 && value.get<double>() <= 24;
        },
        "an integer, in hours from GMT");
    for (const auto& [name, value] : json.items())
        if (name != "serialNumber" && name != "locale" && name != "requestTimestamp" && name != "requestTimezone")
            verdict.reasons.push_back("member " + name + " is not expected");
    if (verdict.reasons.empty()) verdict.serialNumber = json["serialNumber"];
}

}  // namespace

Verdict judge(const httplib::Request& request, const Tokens& tokens, const std::vector<std::string>& requiredHeaders) {
    Verdict verdict;
    Reasons& reasons = verdict.reasons;
    if (request.method != "POST") {
        verdict.status = 400;
        reasons.push_back("the method is not POST");
        return verdict;
    }
    const std::string token = soleHeader(request, std::string(tokenHeader), reasons);
    if (reasons.empty() && !tokens.originOf(token)) reasons.push_back("the token is not valid");
    if (!reasons.empty()) {
        verdict.status = 401;
        return verdict;
    }

    const std::string type = soleHeader(request, "Content-Type", reasons);
    if (!type.empty() && type != "application/json") reasons.push_back("Content-Type is not application/json");
    soleHeader(request, "altDSID", reasons);
    const std::string agent = soleHeader(request, "User-Agent", reasons);
    if (!agent.empty() && !isUserAgent(agent))
        reasons.push_back("User-Agent is not of the form <identifier/version/type>");
    if (request.has_header("storefrontLocale")) soleHeader(request, "storefrontLocale", reasons);
    for (const std::string& name : requiredHeaders) judgeRequired(request, name, reasons);
    judgeBody(request.body, verdict);
    if (!reasons.empty()) verdict.status = 400;
    return verdict;
}

}  // namespace vrx::coverage_server
