#include "coverage_server/control_service.h"

#include <algorithm>
#include <sstream>
#include <stdexcept>

namespace vrx::coverage_server {

namespace {

void answer(httplib::Response& response, const Json& json, int status = 200) {
    response.status = status;
    response.set_content(dumped(json, 2) + "\n", "application/json");
}

void answerNotAllowed(httplib::Response& response) {
    answer(response, {{"reason", "no such method for this path"}}, 405);
}

}  // namespace

void ControlService::serve(const httplib::Request& request, httplib::Response& response, Connection&) {
    try {
        if (request.path == "/")
            response.set_content(std::string(controlHelp), "text/plain");
        else if (request.path == "/faults" || request.path.starts_with("/faults/"))
            faults(request, response);
        else if (request.path == "/requests")
            requests(request, response);
        else if (request.path == "/counters")
            counters(request, response);
        else if (request.path == "/document")
            document(request, response);
        else if (request.path == "/tokens")
            tokens(request, response);
        else
            answer(response, {{"reason", "no such path; / lists them"}}, 404);
    } catch (const std::exception& error) {
        answer(response, {{"reason", error.what()}}, 400);
    }
}

void ControlService::faults(const httplib::Request& request, httplib::Response& response) {
    FaultList& list = coverage_.faults();
    const std::string id = request.path.substr(std::min(request.path.size(), std::string_view("/faults/").size()));
    if (request.method == "POST" && id.empty()) {
        std::istringstream lines(request.body);
        std::vector<Fault> parsed;  // all, before any is added
        for (std::string line; std::getline(lines, line);) parsed.push_back(parseFault(line));
        for (Fault& fault : parsed) list.add(std::move(fault));
        return answer(response, list.json(), 201);
    }
    if (request.method == "DELETE") {
        if (id.empty())
            list.clear();
        else if (!list.remove(std::stoull(id)))
            return answer(response, {{"reason", "no such fault"}}, 404);
    } else if (request.method != "GET") {
        return answerNotAllowed(response);
    }
    answer(response, list.json());
}

void ControlService::requests(const httplib::Request& request, httplib::Response& response) {
    RequestLog& log = coverage_.log();
    if (request.method == "DELETE")
        log.clearRequests();
    else if (request.method != "GET")
        return answerNotAllowed(response);
    auto number = [&request](const char* name, unsigned long otherwise) {
        return request.has_param(name) ? std::stoul(request.get_param_value(name)) : otherwise;
    };
    const unsigned long atLeast = number("atLeast", 0);
    const bool isBegun = number("begun", 0) != 0;
    const Milliseconds longest = std::chrono::seconds(std::min(number("seconds", 10), 600ul));
    const RequestLog::Seen seen = log.requests(atLeast, !isBegun, longest);
    answer(response, seen.requests, seen.isEnough ? 200 : 408);
}

void ControlService::counters(const httplib::Request& request, httplib::Response& response) {
    if (request.method == "DELETE")
        coverage_.log().clearCounters();
    else if (request.method != "GET")
        return answerNotAllowed(response);
    answer(response, coverage_.log().counters());
}

void ControlService::document(const httplib::Request& request, httplib::Response& response) {
    if (request.method == "PATCH")
        coverage_.serverVersion().change(Json::parse(request.body));
    else if (request.method != "GET")
        return answerNotAllowed(response);
    answer(response, coverage_.serverVersion().json());
}

void ControlService::tokens(const httplib::Request& request, httplib::Response& response) {
    if (request.method == "POST")
        coverage_.tokens().add(Json::parse(request.body).at("token").get<std::string>());
    else if (request.method == "DELETE")
        coverage_.tokens().clear();
    else if (request.method != "GET")
        return answerNotAllowed(response);
    answer(response, coverage_.tokens().list());
}

}  // namespace vrx::coverage_server
