// What a server does with its connections and requests. Called on many threads, but for one connection on one at a
// time.
#pragma once

#include <httplib.h>

#include "coverage_server/connection.h"

namespace vrx::coverage_server {

class HttpService {
public:
    virtual ~HttpService() = default;
    // A new connection, of which nothing has been read; false to close it.
    virtual bool admit(Connection&) { return true; }
    virtual void handshakeFailed(const Connection&) {}
    virtual void serve(const httplib::Request& request, httplib::Response& response, Connection& connection) = 0;
    // The answer has been sent, or there is none. The request may have been too malformed to be served.
    virtual void answered(const Connection&) {}
    virtual void ended(const Connection&) {}
    // A connection has been closed at once, because there are too many.
    virtual void refused() {}
};

}  // namespace vrx::coverage_server
