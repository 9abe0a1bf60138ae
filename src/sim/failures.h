// How the simulated host reports that the test itself, or the program under test, broke a rule of the simulation: a
// wait that nothing can end, work that never ends, a request on a connection that serves none.
#pragma once

#include <functional>
#include <string>

namespace vrx::sim {

class Failures {
public:
    // Gets the text of a failure; the simulation then continues as well as it can. Without a handler, a failure ends
    // the program.
    std::function<void(const std::string& text)> handler;

    void report(const std::string& text) const;
};

}  // namespace vrx::sim
