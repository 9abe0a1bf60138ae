// The HTTP library's server, which the relay (HttpServer) asks for the answer to each request. The relay opens a
// connection to it for one request, sends the request's head, and takes everything up to the connection's end as the
// answer. The library never sees a client's connection. It calls the service once it has read the head.
#pragma once

#include <httplib.h>

#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <thread>

#include "coverage_server/client_request.h"
#include "coverage_server/http_service.h"

namespace vrx::coverage_server {

class BackEnd {
public:
    // The service must outlive it. Throws std::system_error when it cannot listen.
    explicit BackEnd(HttpService& service);
    // Every call of answer() must have returned.
    ~BackEnd();

    // The answer's bytes; empty when there is none. Until it returns, only the service may use the connection: the
    // library calls it on another thread.
    std::string answer(const ClientRequest& request, Connection& connection);

private:
    struct Asked {
        const ClientRequest* request;
        Connection* connection;
    };

    void serve(const httplib::Request& head, httplib::Response& response);
    std::optional<Asked> asked(const httplib::Request& head);

    HttpService& service_;
    httplib::Server server_;
    int port_ = -1;
    std::thread listener_;

    std::mutex mutex_;
    std::map<int, Asked> asked_;  // by the port that the relay asks from
};

}  // namespace vrx::coverage_server
