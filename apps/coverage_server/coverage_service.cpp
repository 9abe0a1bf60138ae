#include "coverage_server/coverage_service.h"

#include <algorithm>
#include <cstdio>
#include <map>
#include <sstream>

#include "coverage_server/misbehaviour.h"

namespace vrx::coverage_server {

namespace {

constexpr const char* jsonType = "application/json";

constexpr std::pair<std::string_view, Endpoint> paths[] = {{coveragePath, Endpoint::Coverage},
                                                           {serverVersionPath, Endpoint::ServerVersion},
                                                           {tokenPath, Endpoint::Token},
                                                           {cataloguePath, Endpoint::Catalogue},
                                                           {purchasesPath, Endpoint::Purchases}};

struct Target {
    std::optional<Endpoint> endpoint;
    bool isMoved;
};

Target targetOf(std::string_view path) {
    const bool isMoved = path.starts_with(movedPrefix);
    if (isMoved) path.remove_prefix(movedPrefix.size());
    for (const auto& [served, endpoint] : paths)
        if (path == served) return {endpoint, isMoved};
    return {std::nullopt, isMoved};
}

std::string joined(const std::vector<std::string>& reasons) {
    std::string text;
    for (const std::string& reason : reasons) text.append(text.empty() ? "" : "; ").append(reason);
    return text;
}

void refuse(httplib::Response& response, int status, std::string& reason, std::string text) {
    reason = std::move(text);
    response.status = status;
    response.set_content(dumped({{"reason", reason}}), jsonType);
}

// Control characters that a client sends must not reach a terminal.
std::string printable(std::string text) {
    constexpr std::size_t longest = 300;
    if (text.size() > longest) text.resize(longest);
    std::ranges::replace_if(
        text, [](char c) { return c < ' ' || c == '\x7f'; }, '?');
    return text;
}

httplib::Headers shownHeaders(httplib::Headers headers, const Tokens& tokens) {
    const auto [begin, end] = headers.equal_range(std::string(tokenHeader));
    for (auto header = begin; header != end; ++header)
        header->second = "(hidden: " + tokens.originOf(header->second).value_or("not valid") + ")";
    return headers;
}

std::map<std::string, std::string> keyValueLines(const std::string& text) {
    std::map<std::string, std::string> entries;
    std::istringstream lines(text);
    for (std::string line; std::getline(lines, line);) {
        if (line.ends_with('\r')) line.pop_back();
        const std::size_t equals = line.find('=');
        if (equals != line.npos) entries[line.substr(0, equals)] = line.substr(equals + 1);
    }
    return entries;
}

}  // namespace

CoverageService::CoverageService(const CoverageServiceSettings& settings)
    : isQuiet_(settings.isQuiet),
      printsRequests_(settings.printsRequests),
      requiredHeaders_(settings.requiredHeaders),
      records_(settings.records),
      store_(settings.store),
      serverVersion_(settings.serverVersion),
      tokens_(settings.tokens) {}

bool CoverageService::admit(Connection& connection) {
    log_.countConnection();
    const FaultPlan plan = faults_.take(Endpoint::Connection);
    if (plan.description.empty()) return true;
    print("#" + std::to_string(connection.id()) + " connection fault=" + plan.description);
    return misbehave(plan, connection);
}

void CoverageService::serve(const httplib::Request& request, httplib::Response& response, Connection& connection) {
    const Target target = targetOf(request.path);
    SeenRequest seen;
    seen.time = std::chrono::system_clock::now();
    seen.connection = connection.id();
    seen.requestOfConnection = connection.requests();
    if (target.endpoint) seen.endpoint = nameOf(*target.endpoint);
    seen.method = request.method;
    seen.path = request.target;
    seen.headers = shownHeaders(request.headers, tokens_);
    seen.body = request.body;
    seen.bodyBytes = request.body.size();
    Connection::Exchange& exchange = connection.exchange;
    exchange.asked = request.method + " " + request.target;
    exchange.request = log_.begin(std::move(seen));

    if (!target.endpoint) return refuse(response, 404, exchange.reason, "no such path");
    const FaultPlan plan = target.isMoved ? FaultPlan{} : faults_.take(*target.endpoint);
    exchange.fault = plan.description;
    if (!wait(plan, connection)) return connection.takeOver(0);
    if (!plan.fault || plan.fault->kind->bendsAnswer) answer(*target.endpoint, request, response, exchange.reason);
    if (plan.fault) misbehave(*plan.fault, *target.endpoint, request, response, connection);
}

void CoverageService::answer(Endpoint endpoint, const httplib::Request& request, httplib::Response& response,
                             std::string& reason) {
    try {
        if (endpoint == Endpoint::Coverage) return answerCoverage(request, response, reason);
        if (endpoint == Endpoint::Token) return answerToken(request, response, reason);
        if (request.method != "GET" && request.method != "HEAD")
            return refuse(response, 405, reason, "the method is not GET");
        if (endpoint == Endpoint::ServerVersion) return serverVersion_.answer(request, response);
        answerStore(endpoint, request, response, reason);
    } catch (const std::runtime_error& error) {  // a file cannot be read
        refuse(response, 500, reason, error.what());
    }
}

void CoverageService::answerCoverage(const httplib::Request& request, httplib::Response& response,
                                     std::string& reason) const {
    const Verdict verdict = judge(request, tokens_, requiredHeaders_);
    if (verdict.status != 200) return refuse(response, verdict.status, reason, joined(verdict.reasons));
    const std::string record = records_.record(verdict.serialNumber);
    if (record.empty()) return refuse(response, 404, reason, "no record for this serial number, and no default.json");
    response.status = 200;
    response.set_content(record, jsonType);
}

// Reads and writes lines of key=value, as a credential helper does, so that curl alone can be the helper.
void CoverageService::answerToken(const httplib::Request& request, httplib::Response& response, std::string& reason) {
    if (request.method != "POST") return refuse(response, 405, reason, "the method is not POST");
    auto entries = keyValueLines(request.body);
    if (entries["account"].empty() || entries["service"].empty())
        return refuse(response, 400, reason, "lines account=... and service=... are needed");
    response.status = 200;
    response.set_content("token=" + tokens_.renew(entries["account"], entries["service"]) + "\n", "text/plain");
}

void CoverageService::answerStore(Endpoint endpoint, const httplib::Request& request, httplib::Response& response,
                                  std::string& reason) const {
    const bool isCatalogue = endpoint == Endpoint::Catalogue;
    const StoreQuestion question = isCatalogue ? catalogueQuestion(request) : purchasesQuestion(request);
    if (!question.reasons.empty()) return refuse(response, 400, reason, joined(question.reasons));
    const Json answer = isCatalogue ? store_.items(question) : store_.purchases(question);
    response.status = 200;
    response.set_content(dumped(answer), jsonType);
}

bool CoverageService::wait(const FaultPlan& plan, Connection& connection) const {
    constexpr Milliseconds beforeNextLook(10);
    bool isThere = connection.pause(plan.delay);
    while (isThere && faults_.holds(plan)) isThere = connection.pause(beforeNextLook);
    return isThere;
}

void CoverageService::answered(const Connection& connection) {
    const Connection::Exchange& exchange = connection.exchange;
    const int status = connection.status();
    const auto taken = std::chrono::steady_clock::now() - exchange.begun;
    std::string line = "#" + std::to_string(connection.id()) + "." + std::to_string(connection.requests()) + " ";
    line += exchange.isServed ? printable(exchange.asked) : "malformed request";
    line += " " + (status ? std::to_string(status) : "unanswered");
    line += " " + std::to_string(std::chrono::duration_cast<Milliseconds>(taken).count()) + "ms";
    if (!exchange.fault.empty()) line += " fault=" + printable(exchange.fault);
    if (!exchange.reason.empty()) line += " (" + printable(exchange.reason) + ")";
    print(line);  // before finish() wakes those who wait for the answer

    if (!exchange.isServed) return log_.countMalformed(status);
    const SeenRequest seen = log_.finish(exchange.request, status, exchange.fault, exchange.reason);
    if (printsRequests_ && seen.id) {
        const std::string text = dumped(seen.json()) + "\n";
        std::fwrite(text.data(), 1, text.size(), stdout);
        std::fflush(stdout);
    }
}

void CoverageService::handshakeFailed(const Connection& connection) {
    log_.countHandshakeFailure();
    print("#" + std::to_string(connection.id()) + " TLS handshake failed");
}

void CoverageService::ended(const Connection& connection) {
    log_.countEnded(connection.bytesSent());
}

void CoverageService::refused() {
    log_.countRefused();
}

void CoverageService::print(const std::string& line) const {
    if (!isQuiet_) std::fprintf(stderr, "%s\n", line.c_str());
}

}  // namespace vrx::coverage_server
