#include "end_to_end/programs.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <csignal>
#include <filesystem>
#include <fstream>

#include "vrx/codec/json.h"

extern char** environ;

namespace vrx::end_to_end {

namespace {

std::vector<char*> pointers(const Arguments& texts) {
    std::vector<char*> result;
    for (const std::string& text : texts) result.push_back(const_cast<char*>(text.c_str()));
    result.push_back(nullptr);
    return result;
}

}  // namespace

std::string fileText(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

sockaddr_un addressOf(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof address.sun_path - 1);
    return address;
}

SilentServer::SilentServer(const std::string& path)
    : file_(socket(path.empty() ? AF_INET : AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    const sockaddr_un there = addressOf(path);
    sockaddr_in loopback{};
    loopback.sin_family = AF_INET;
    loopback.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t size = path.empty() ? sizeof loopback : sizeof there;
    EXPECT_EQ(
        bind(file_,
             path.empty() ? reinterpret_cast<const sockaddr*>(&loopback) : reinterpret_cast<const sockaddr*>(&there),
             size),
        0);
    EXPECT_EQ(listen(file_, 64), 0);
    if (!path.empty()) return;
    EXPECT_EQ(getsockname(file_, reinterpret_cast<sockaddr*>(&loopback), &size), 0);
    url_ = "http://127.0.0.1:" + std::to_string(ntohs(loopback.sin_port)) + "/";
}

SilentServer::~SilentServer() {
    close(file_);
}

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
    Arguments words{program};
    Arguments variables = environment;
    if (handed.listeningSocket >= 0) {
        posix_spawn_file_actions_adddup2(&actions, handed.listeningSocket, 3);
        variables.emplace_back("LISTEN_FDS=1");
        words = {"/bin/sh", "-c", "LISTEN_PID=$$ exec \"$0\" \"$@\"", program};  // the process must be named
    }
    words.insert(words.end(), arguments.begin(), arguments.end());
    for (char** variable = environ; *variable; ++variable) variables.emplace_back(*variable);
    EXPECT_EQ(posix_spawn(&pid_, words.front().c_str(), &actions, nullptr, pointers(words).data(),
                          pointers(variables).data()),
              0)
        << program;
    posix_spawn_file_actions_destroy(&actions);
    pidFile_ = static_cast<int>(syscall(SYS_pidfd_open, pid_, 0));
}

Process::~Process() {
    if (!result_) {
        signal(SIGKILL);
        wait();
    }
    close(pidFile_);
}

bool Process::isRunning() const {
    pollfd ended{pidFile_, POLLIN, 0};
    return poll(&ended, 1, 0) == 0;
}

void Process::signal(int number) const {
    kill(pid_, number);
}

int Process::wait() {
    if (result_) return *result_;
    int status = 0;
    waitpid(pid_, &status, 0);
    result_ = WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
    return *result_;
}

std::string Process::output() const {
    return fileText(files_ + ".out");
}

std::string Process::errors() const {
    return fileText(files_ + ".err");
}

NoticeSocket::NoticeSocket(const std::string& path)
    : path_(path), file_(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
    const sockaddr_un address = addressOf(path);
    unlink(path.c_str());
    EXPECT_EQ(bind(file_, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
}

NoticeSocket::~NoticeSocket() {
    close(file_);
}

std::string NoticeSocket::next(const Process& process) const {
    std::array<pollfd, 2> files{{{file_, POLLIN, 0}, {process.endedFile(), POLLIN, 0}}};
    poll(files.data(), files.size(), -1);
    std::array<char, 4096> text;
    const ssize_t size = recv(file_, text.data(), text.size(), MSG_DONTWAIT);
    return {text.data(), size > 0 ? static_cast<std::size_t>(size) : 0};
}

Place::Place() {
    umask(022);  // a bundle that others can write is none
    std::string pattern = std::filesystem::canonical(std::filesystem::temp_directory_path()) / "vrx-XXXXXX";
    folder_ = mkdtemp(pattern.data());
    std::filesystem::create_directory(*this / "app");
    for (const char* name : {"vrxctl", "vrxhost", "bundle.toml"})
        std::filesystem::copy(std::string(VRX_PROGRAMS "/") + name, *this / "app");
    std::filesystem::copy(VRX_SOURCE "/examples/device.toml", folder_);
    std::filesystem::copy(VRX_SOURCE "/examples/coverage", *this / "coverage");
}

Place::~Place() {
    agent_.reset();
    std::filesystem::remove_all(folder_);
}

void Place::write(const std::string& name, const std::string& text) const {
    std::ofstream(*this / name, std::ios::binary) << text;
}

void Place::start() {
    const NoticeSocket notices(*this / "notices");
    agent_ = std::make_unique<Process>(
        folder_, VRX_PROGRAMS "/vrxagent",
        Arguments{"--home", *this / "home", "--device", *this / "device.toml", "--socket", *this / "socket"},
        Arguments{notices.variable()});
    isReady_ = notices.next(*agent_) == "READY=1";
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
    Arguments all{"--socket", *this / socket};
    all.insert(all.end(), arguments.begin(), arguments.end());
    return run(*this / "app/vrxctl", all);
}

Place::Outcome Place::vrxhost(const Arguments& arguments, const std::string& home) const {
    Arguments all{"--home", *this / home};
    all.insert(all.end(), arguments.begin(), arguments.end());
    return run(*this / "app/vrxhost", all);
}

Place::Outcome Place::run(const std::string& program, const Arguments& arguments) const {
    Arguments words{program};
    words.insert(words.end(), arguments.begin(), arguments.end());
    return runAll({words}).front();
}

std::vector<Place::Outcome> Place::runAll(const std::vector<Arguments>& commands) const {
    std::vector<std::unique_ptr<Process>> processes;
    for (const Arguments& words : commands)
        processes.push_back(
            std::make_unique<Process>(folder_, words.front(), Arguments(words.begin() + 1, words.end())));
    std::vector<Outcome> outcomes;
    for (const auto& process : processes) {
        const int code = process->wait();
        Outcome& outcome = outcomes.emplace_back(Outcome{code, process->output(), process->errors(), {}});
        if (auto document = codec::parseJson(outcome.output)) outcome.document = *document;
    }
    return outcomes;
}

}  // namespace vrx::end_to_end
