// The control port: changes faults, settings and tokens while the server runs, and shows what it has seen.
#pragma once

#include <string_view>

#include "coverage_server/coverage_service.h"

namespace vrx::coverage_server {

inline constexpr std::string_view controlHelp =
    "  GET    /faults        the faults, with what is left of their counts\n"
    "  POST   /faults        adds faults, a description each line\n"
    "  DELETE /faults        removes all; /faults/ID removes one\n"
    "  GET    /requests      the requests seen, in order (at most the last 4096): id, time, connection,\n"
    "                        requestOfConnection, endpoint, method, path, headers, body, bodyBytes, answered, status,\n"
    "                        fault, reason. ?atLeast=N waits until so many have been answered (&begun=1: have "
    "arrived),\n"
    "                        for at most &seconds=S (10); the answer is 408 when they have not\n"
    "  DELETE /requests      forgets them\n"
    "  GET    /counters      connections, requests, requests on reused connections, by endpoint, by status, ...\n"
    "  DELETE /counters      sets them to 0\n"
    "  GET    /document      the settings of the server-version document\n"
    "  PATCH  /document      changes those that are given\n"
    "  GET    /tokens        the valid ones; POST {\"token\":TEXT} adds one; DELETE makes all invalid\n";

class ControlService final : public HttpService {
public:
    explicit ControlService(CoverageService& coverage) : coverage_(coverage) {}
    void serve(const httplib::Request& request, httplib::Response& response, Connection& connection) override;

private:
    void faults(const httplib::Request& request, httplib::Response& response);
    void requests(const httplib::Request& request, httplib::Response& response);
    void counters(const httplib::Request& request, httplib::Response& response);
    void document(const httplib::Request& request, httplib::Response& response);
    void tokens(const httplib::Request& request, httplib::Response& response);

    CoverageService& coverage_;
};

}  // namespace vrx::coverage_server
