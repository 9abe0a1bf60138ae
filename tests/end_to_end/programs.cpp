#include "end_to_end/programs.h"

#include <poll.h>
#include <spawn.h>
#include <sys/stat.h>

#include <csignal>

#include "support/sockets.h"
#include "vrx/codec/json.h"

extern char** environ;

namespace vrx::end_to_end {

namespace {

// Whatever this machine and its user have.
const bool isApart = setenv("DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nowhere/bus", 1) == 0 &&
                     setenv("XDG_CONFIG_HOME", "/nowhere/config", 1) == 0;

std::vector<char*> pointers(const Arguments& texts) {
    std::vector<char*> result;
    for (const std::string& text : texts) result.push_back(const_cast<char*>(text.c_str()));
    result.push_back(nullptr);
    return result;
}

}  // namespace

Process::Process(const std::string& folder, const std::string& program, const Arguments& arguments,
                 const Arguments& environment, const Handed& handed) {
    static std::atomic<int> count = 0;
    files_ = folder + "/process-" + std::to_string(++count);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
    if (handed.output >= 0)
        posix_spawn_file_actions_adddup2(&actions, handed.output, 1);
    else
        posix_spawn_file_actions_addopen(&actions, 1, (files_ + ".out").c_str(), O_WRONLY | O_CREAT, 0600);
    posix_spawn_file_actions_addopen(&actions, 2, (files_ + ".err").c_str(), O_WRONLY | O_CREAT, 0600);
    words_ = {program};
    words_.insert(words_.end(), arguments.begin(), arguments.end());
    Arguments words{program};
    Arguments variables = environment;
    if (handed.listeningSocket >= 0) {
        posix_spawn_file_actions_adddup2(&actions, handed.listeningSocket, 3);
        variables.emplace_back("LISTEN_FDS=1");
        words = {"/bin/sh", "-c", "LISTEN_PID=$$ exec \"$0\" \"$@\"", program};  // the process must be named
    }
    words.insert(words.end(), arguments.begin(), arguments.end());
    variables.emplace_back("VRXAGENT_SOCKET=" + folder + "/socket");
    for (char** variable = environ; *variable; ++variable) variables.emplace_back(*variable);
    EXPECT_EQ(posix_spawn(&pid_, words.front().c_str(), &actions, nullptr, pointers(words).data(),
                          pointers(variables).data()),
              0)
        << program;
    posix_spawn_file_actions_destroy(&actions);
    pidFile_ = host::openProcess(pid_);
}

Process::~Process() {
    if (!result_) {
        signal(SIGKILL);
        wait();
    }
}

void Process::signal(int number) const {
    kill(pid_, number);
}

int Process::wait() {
    if (result_) return *result_;
    result_ = host::endOf(pid_);
    keepDocuments();
    return *result_;
}

// For scripts/check-documents.
void Process::keepDocuments() const {
    const char* folder = std::getenv("VRX_DOCUMENTS");
    const bool isJson = std::ranges::find(words_, platform::Value("--json")) != words_.end();
    if (!folder || !isJson || *result_ < 0) return;
    const std::string name = std::to_string(getpid()) + "-" + std::to_string(pid_);
    host::writeFile(std::string(folder) + "/" + name,
                    codec::printedJson(words_, codec::JsonLayout::OneLine) + "\n" + output());
}

NoticeSocket::NoticeSocket(const std::string& path)
    : path_(path), file_(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
    const sockaddr_un address = addressOf(path);
    unlink(path.c_str());
    EXPECT_EQ(bind(file_.number(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
}

std::string NoticeSocket::next(const Process& process) const {
    std::array<pollfd, 2> files{{{file_.number(), POLLIN, 0}, {process.endedFile(), POLLIN, 0}}};
    poll(files.data(), files.size(), 60'000);
    std::array<char, 4096> text;
    const ssize_t size = recv(file_.number(), text.data(), text.size(), MSG_DONTWAIT);
    return {text.data(), size > 0 ? static_cast<std::size_t>(size) : 0};
}

Place::Place() {
    umask(022);  // a bundle that others can write is none
    std::filesystem::create_directory(*this / "app");
    for (const char* name : {"vrxctl", "vrxhost", "bundle.toml"})
        std::filesystem::copy(std::string(VRX_PROGRAMS "/") + name, *this / "app");
    std::filesystem::copy(VRX_SOURCE "/examples/device.toml", path());
    std::filesystem::copy(VRX_SOURCE "/examples/coverage", *this / "coverage");
}

void Place::start() {
    const NoticeSocket notices(*this / "notices");
    agent_ = std::make_unique<Process>(
        path(), VRX_PROGRAMS "/vrxagent",
        Arguments{"--home", *this / "home", "--device", *this / "device.toml", "--socket", *this / "socket"},
        Arguments{notices.variable()});
    ASSERT_EQ(notices.next(*agent_), "READY=1") << agent_->errors();
}

int Place::stop() {
    agent_->signal(SIGTERM);
    return agent_->wait();
}

void Place::useCoverageFiles() {
    for (auto [key, file] : {std::pair("WarrantyURL", "coverage/Warranty.plist"),
                             std::pair("ServerVersionURL", "coverage/ServerVersion.plist")})
        ASSERT_EQ(vrxhost({"defaults", "write", key, "--string", "file://" + *this / file}).code, 0);
}

Place::Outcome Place::vrxctl(const Arguments& arguments, const std::string& socket) const {
    return run(*this / "app/vrxctl", {"--socket", *this / socket}, arguments);
}

Place::Outcome Place::vrxhost(const Arguments& arguments) const {
    return run(*this / "app/vrxhost", {"--home", *this / "home"}, arguments);
}

Place::Outcome Place::run(const std::string& program, const Arguments& arguments, const Arguments& more) const {
    Arguments words{program};
    for (const Arguments* some : {&arguments, &more}) words.insert(words.end(), some->begin(), some->end());
    return runAll({words}).front();
}

std::vector<Place::Outcome> Place::runAll(const std::vector<Arguments>& commands) const {
    std::vector<std::unique_ptr<Process>> processes;
    for (const Arguments& words : commands)
        processes.push_back(
            std::make_unique<Process>(path(), words.front(), Arguments(words.begin() + 1, words.end())));
    std::vector<Outcome> outcomes;
    for (const auto& process : processes) {
        const int code = process->wait();
        Outcome& outcome = outcomes.emplace_back(Outcome{code, process->output(), process->errors(), {}});
        if (auto document = codec::parseJson(outcome.output)) outcome.document = *document;
    }
    return outcomes;
}

}  // namespace vrx::end_to_end
