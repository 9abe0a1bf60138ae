// Carries out a fault on a connection: takes the answer over and sends other bytes.
#pragma once

#include <httplib.h>

#include "coverage_server/connection.h"
#include "coverage_server/faults.h"

namespace vrx::coverage_server {

// Before the first request; false when the connection is to be closed.
bool misbehave(const FaultPlan& plan, Connection& connection);

// In place of an answer. The response holds the genuine answer if the fault bends it. A fault that is valid HTTP only
// changes the response, which is then sent as usual; the others send on the connection.
void misbehave(const Fault& fault, Endpoint endpoint, const httplib::Request& request, httplib::Response& response,
               Connection& connection);

}  // namespace vrx::coverage_server
