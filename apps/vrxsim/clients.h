// The applications that ask the agent, and what must always hold for them: at most one reply to a request, and exactly
// one when process and connection live and requests pause for a while.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "vrx/protocols/agent_protocol.h"
#include "vrxsim/rules.h"
#include "vrxsim/verdict.h"
#include "vrxsim/world.h"

namespace vrx::simulation {

// With what the cause of a client's request begins; the operation follows.
inline const std::string causeOfClients = "client ";

class Clients {
public:
    Clients(World& world, Rules& rules, Verdict& verdict, Trace& trace)
        : world_(world), rules_(rules), verdict_(verdict), trace_(trace) {}

    std::function<void(const std::string& serialNumber)> dismissalIsAsked = [](const auto&) {};

    // Lets an event happen that is a client's. Returns false for any other.
    bool happen(const Event& event);
    // To be called before the process ends: its connections end with it, and nobody waits for replies any more.
    void processEnds();
    void check();

    // The devices whose dismissal was replied to, with no failure on its way, and was not taken back.
    const std::set<std::string>& dismissed() const { return dismissed_; }
    void takeBackDismissals() { dismissed_.clear(); }
    // How often an outreach was asked for so far.
    int outreaches() const { return outreaches_; }

private:
    struct Request {
        int connection = 0;
        std::string what;
        int replies = 0;
    };
    struct Connection {
        std::shared_ptr<sim::ServiceConnection> service;
        double lastAsked = 0;
    };

    Connection* connect(int number);
    void ask(const std::vector<std::string>& words);
    void dismiss(const std::string& serialNumber);
    // Sends a request and returns its number; 0 when there is no agent.
    int send(int connection, const std::string& what, platform::UniqueFunction<void(VRXAgentProtocol&, int)> call);
    void take(int request, std::string_view reply);
    void checkListRefresh();
    // Tells later whether anything was to fail between now and then.
    std::function<bool()> failureWatch() const;
    template <class T>
    auto reply(int request);

    World& world_;
    Rules& rules_;
    Verdict& verdict_;
    Trace& trace_;
    std::map<int, Connection> connections_;
    std::map<int, Request> open_;  // by number
    int lastNumber_ = 0;
    int outreaches_ = 0;
    std::set<std::string> dismissed_;
};

}  // namespace vrx::simulation
