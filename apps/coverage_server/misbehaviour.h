// Carries a fault out on a connection: takes the answer over and sends what the fault wants on the wire.
#pragma once

#include <httplib.h>

#include "coverage_server/connection.h"
#include "coverage_server/faults.h"

namespace vrx::coverage_server {

// Before there is a request; false when the connection is to be closed.
bool misbehave(const FaultPlan& plan, Connection& connection);

// Instead of the response, which holds the genuine answer if the fault bends that. A fault that HTTP can express only
// changes the response, for the library to send.
void misbehave(const Fault& fault, Endpoint endpoint, const httplib::Request& request, httplib::Response& response,
               Connection& connection);

}  // namespace vrx::coverage_server
