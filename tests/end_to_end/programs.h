// The real programs in a folder of their own that goes away: started, stopped and asked without waiting for anything
// but what they do.
#pragma once

#include <gtest/gtest.h>
#include <sys/un.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "vrx/platform/value.h"

namespace vrx::end_to_end {

using Arguments = std::vector<std::string>;

std::string fileText(const std::string& path);

sockaddr_un addressOf(const std::string& path);

// Takes connections, and never says anything: at a path, or without one on loopback.
class SilentServer {
public:
    explicit SilentServer(const std::string& path = "");
    ~SilentServer();
    SilentServer(const SilentServer&) = delete;
    SilentServer& operator=(const SilentServer&) = delete;

    int file() const { return file_; }
    // Of the one on loopback.
    const std::string& url() const { return url_; }

private:
    const int file_;
    std::string url_;
};

// A child process with its standard output and error in files.
class Process {
public:
    // Descriptors that it gets.
    struct Handed {
        int output = -1;           // else its standard output is a file
        int listeningSocket = -1;  // in the way of a service manager
    };
    // The environment is this process's, with the given variables in front.
    Process(const std::string& folder, const std::string& program, const Arguments& arguments,
            const Arguments& environment, const Handed& handed);
    Process(const std::string& folder, const std::string& program, const Arguments& arguments,
            const Arguments& environment = {})
        : Process(folder, program, arguments, environment, Handed()) {}
    ~Process();  // kills it, if it has not been waited for
    Process(const Process&) = delete;
    Process& operator=(const Process&) = delete;

    int identifier() const { return pid_; }
    bool isRunning() const;
    void signal(int number) const;
    // Its exit code, or the negative signal that ended it.
    int wait();
    // Readable once it has ended.
    int endedFile() const { return pidFile_; }

    std::string output() const;
    std::string errors() const;

private:
    std::string files_;
    int pid_ = 0;
    int pidFile_ = -1;
    std::optional<int> result_;
};

// Where a process sends its service manager's notices.
class NoticeSocket {
public:
    explicit NoticeSocket(const std::string& path);
    ~NoticeSocket();
    NoticeSocket(const NoticeSocket&) = delete;
    NoticeSocket& operator=(const NoticeSocket&) = delete;

    // For the environment of the process.
    std::string variable() const { return "NOTIFY_SOCKET=" + path_; }
    // The next notice, as soon as it comes; empty once the process has ended without one.
    std::string next(const Process& process) const;

private:
    const std::string path_;
    const int file_;
};

// A folder with an agent's home, profile, socket and coverage files, and entitled copies of the tools.
class Place {
public:
    Place();
    ~Place();
    Place(const Place&) = delete;
    Place& operator=(const Place&) = delete;

    std::string operator/(const std::string& name) const { return folder_ + "/" + name; }
    void write(const std::string& name, const std::string& text) const;

    // An agent of this place: comes back once it is ready or has ended.
    void start();
    bool isReady() const { return isReady_; }
    bool isRunning() const { return agent_->isRunning(); }
    Process& agent() { return *agent_; }
    // SIGTERM, and what wait() gives.
    int stop();
    // Has the running agent take records and server versions from the coverage files.
    void useCoverageFiles();

    struct Outcome {
        int code;
        std::string output;
        std::string errors;
        platform::Value document;  // of the output, null when it is no JSON
    };
    Outcome vrxctl(const Arguments& arguments, const std::string& socket = "socket") const;
    Outcome vrxhost(const Arguments& arguments, const std::string& home = "home") const;
    // A path in the programs' folder, or here.
    Outcome run(const std::string& program, const Arguments& arguments) const;
    // All at the same time. The programs are the first words.
    std::vector<Outcome> runAll(const std::vector<Arguments>& commands) const;

private:
    std::string folder_;
    std::unique_ptr<Process> agent_;
    bool isReady_ = false;
};

}  // namespace vrx::end_to_end
