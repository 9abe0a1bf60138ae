// The served port: coverage, the server-version document, token renewal, the store's catalogue and purchases, each with
// the faults that were ordered.
#pragma once

#include <chrono>
#include <filesystem>
#include <string>
#include <vector>

#include "coverage_server/coverage_records.h"
#include "coverage_server/coverage_request.h"
#include "coverage_server/faults.h"
#include "coverage_server/http_service.h"
#include "coverage_server/request_log.h"
#include "coverage_server/server_version_document.h"
#include "coverage_server/store_file.h"
#include "coverage_server/tokens.h"

namespace vrx::coverage_server {

inline constexpr std::string_view coveragePath = "/api/v2/coverage/summary";
inline constexpr std::string_view serverVersionPath = "/library/ORVANE/asset/vrxV2.plist";
inline constexpr std::string_view tokenPath = "/token/renew";
inline constexpr std::string_view cataloguePath = "/store/lookup";
inline constexpr std::string_view purchasesPath = "/store/purchases";
// Everything is served under this prefix too, without faults, so that redirects have somewhere to lead.
inline constexpr std::string_view movedPrefix = "/moved";

struct CoverageServiceSettings {
    std::filesystem::path records;
    std::filesystem::path store;
    std::vector<std::string> tokens;
    std::vector<std::string> requiredHeaders = defaultRequiredHeaders;
    ServerVersionSettings serverVersion;
    bool isQuiet = false;         // prints no line on stderr for each request
    bool printsRequests = false;  // as JSON on stdout, with tokens hidden
};

class CoverageService final : public HttpService {
public:
    explicit CoverageService(const CoverageServiceSettings& settings);

    bool admit(Connection& connection) override;
    void handshakeFailed(const Connection& connection) override;
    void serve(const httplib::Request& request, httplib::Response& response, Connection& connection) override;
    void answered(const Connection& connection) override;
    void ended(const Connection& connection) override;
    void refused() override;

    FaultList& faults() { return faults_; }
    RequestLog& log() { return log_; }
    Tokens& tokens() { return tokens_; }
    ServerVersionDocument& serverVersion() { return serverVersion_; }

private:
    void answer(Endpoint endpoint, const httplib::Request& request, httplib::Response& response, std::string& reason);
    void answerCoverage(const httplib::Request& request, httplib::Response& response, std::string& reason) const;
    void answerToken(const httplib::Request& request, httplib::Response& response, std::string& reason);
    void answerStore(Endpoint endpoint, const httplib::Request& request, httplib::Response& response,
                     std::string& reason) const;
    // Waits as the plan says. False when the client leaves, or the server ends, before that is over.
    bool wait(const FaultPlan& plan, Connection& connection) const;
    void print(const std::string& line) const;

    const bool isQuiet_;
    const bool printsRequests_;
    const std::vector<std::string> requiredHeaders_;
    const CoverageRecords records_;
    const StoreFile store_;
    ServerVersionDocument serverVersion_;
    Tokens tokens_;
    FaultList faults_;
    RequestLog log_;
};

}  // namespace vrx::coverage_server
