#include "vrxhost/running_agent.h"

#include <dirent.h>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <memory>
#include <variant>

#include "vrx/client/agent_bus.h"
#include "vrx/codec/core/keyed_archive.h"
#include "vrx/host/base/files.h"
#include "vrx/host/base/trust.h"
#include "vrx/host/home/home_lock.h"

namespace vrx::apps {

using client::Failure;

namespace {

// Long enough for an agent under load; a person waits for it.
constexpr std::chrono::seconds longestWait(5);

// Whether a process of the user is an agent, and not one that has ended.
bool runsAgent(uid_t user) {
    const std::unique_ptr<DIR, int (*)(DIR*)> processes(opendir("/proc"), closedir);
    while (const dirent* entry = processes ? readdir(processes.get()) : nullptr) {
        const std::string process = std::string("/proc/") + entry->d_name;
        struct stat status;
        if (stat(process.c_str(), &status) != 0 || status.st_uid != user) continue;
        const auto name = host::readFile(process + "/stat");
        if (name && name->text().find(" (vrxagent) ") != std::string_view::npos &&
            name->text().find(" (vrxagent) Z") == std::string_view::npos)
            return true;
    }
    return false;
}

RunningAgent::Presence presenceAt(const std::string& home) {
    using enum RunningAgent::Presence;
    if (!whoElseMayLook(home)) return host::HomeLock::isInUse(home) ? Yes : No;
    struct stat status;
    return stat(home.c_str(), &status) == 0 && runsAgent(status.st_uid) ? Yes : Unknown;
}

std::variant<host::AgentStatus, Failure> ask(const std::string& socket, platform::Duration limit) {
    const auto deadline =
        std::chrono::steady_clock::now() + std::chrono::duration_cast<std::chrono::steady_clock::duration>(
                                               std::min<platform::Duration>(limit, longestWait));
    client::AgentBus bus;
    if (const auto error = bus.open(socket, deadline))
        return Failure{error->code == ETIMEDOUT ? Failure::Kind::TimedOut : Failure::Kind::NotReachable, error->text};
    client::CallResult result = bus.call(wire::statusOperation, {}, deadline, wire::hostInterface);
    if (const auto* failure = std::get_if<Failure>(&result)) return *failure;
    if (const auto* ended = std::get_if<client::ConnectionEnded>(&result))
        return Failure{Failure::Kind::NotReachable, ended->text};
    using enum platform::AllowedKinds::Kind;
    const auto value =
        codec::unarchiveValue(std::get<platform::Value>(result), {Dictionaries, Arrays, Strings, Numbers});
    const auto status = value ? host::agentStatus(*value) : std::nullopt;
    if (status) return *status;
    return Failure{Failure::Kind::BadReply, "the agent's answer is of another release"};
}

}  // namespace

RunningAgent findRunningAgent(const wire::Locations& places, platform::Duration limit) {
    RunningAgent agent{presenceAt(places.home.path)};
    if (agent.presence != RunningAgent::Presence::Yes) return agent;
    auto answer = ask(places.socket.path, limit);
    if (auto* status = std::get_if<host::AgentStatus>(&answer))
        agent.status = std::move(*status);
    else
        agent.failure = std::get<Failure>(std::move(answer));
    return agent;
}

std::optional<std::string> whoElseMayLook(const std::string& home) {
    struct stat status;
    if (stat(home.c_str(), &status) != 0) return errno == EACCES ? std::optional<std::string>("root") : std::nullopt;
    if (!S_ISDIR(status.st_mode) || access(home.c_str(), R_OK | W_OK | X_OK) == 0 || errno != EACCES)
        return std::nullopt;
    return status.st_uid == 0 ? "root" : userName(status.st_uid) + " and root";
}

void judgeAsAgentAt(const std::string& home) {
    struct stat status;
    if (stat(home.c_str(), &status) == 0) host::judgeAsAgentOf(status.st_uid);
}

std::string userName(uid_t user) {
    const passwd* entry = getpwuid(user);
    return entry ? entry->pw_name : "user " + std::to_string(user);
}

}  // namespace vrx::apps
