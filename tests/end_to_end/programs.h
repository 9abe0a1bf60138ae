// The real programs in a folder of their own that goes away: started, stopped and asked without waiting for anything
// but what they do.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "host/support.h"
#include "vrx/platform/value.h"

namespace vrx::end_to_end {

using Arguments = std::vector<std::string>;

using host::fileText;

// Descriptors that a process gets.
struct Handed {
    int output = -1;           // else its standard output is a file
    int listeningSocket = -1;  // in the way of a service manager
};

// A child process with its standard output and error in files.
class Process {
public:
    // The environment is this process's, with the given variables in front.
    Process(const std::string& folder, const std::string& program, const Arguments& arguments,
            const Arguments& environment = {}, const Handed& handed = {});
    ~Process();  // kills it, if it has not been waited for

    int identifier() const { return pid_; }
    void signal(int number) const;
    // Its exit code, or the negative signal that ended it.
    int wait();
    // Readable once it has ended.
    int endedFile() const { return pidFile_.number(); }

    std::string output() const { return fileText(files_ + ".out"); }
    std::string errors() const { return fileText(files_ + ".err"); }

private:
    void keepDocuments() const;

    std::string files_;
    platform::Array words_;
    int pid_ = 0;
    host::Descriptor pidFile_;
    std::optional<int> result_;
};

// Where a process sends its service manager's notices.
class NoticeSocket {
public:
    explicit NoticeSocket(const std::string& path);

    // For the environment of the process.
    std::string variable() const { return "NOTIFY_SOCKET=" + path_; }
    // The next notice, as soon as it comes; empty once the process has ended without one, or after a minute.
    std::string next(const Process& process) const;

private:
    const std::string path_;
    const host::Descriptor file_;
};

// A folder with an agent's home, profile, socket and coverage files, and entitled copies of the tools.
class Place : public host::TemporaryFolder {
public:
    Place();

    void write(const std::string& name, const std::string& text) const { host::writeFile(*this / name, text); }
    // An agent of this place: comes back once it is ready.
    void start();
    Process& agent() { return *agent_; }
    // SIGTERM, and what wait() gives.
    int stop();
    // Has the running agent take records and server versions from the coverage files.
    void useCoverageFiles();

    struct Outcome {
        int code;
        std::string output;
        std::string errors;
        Value document;  // of the output, null when it is no JSON
    };
    Outcome vrxctl(const Arguments& arguments, const std::string& socket = "socket") const;
    Outcome vrxhost(const Arguments& arguments) const;
    Outcome run(const std::string& program, const Arguments& arguments, const Arguments& more = {}) const;
    // All at the same time. The programs are the first words.
    std::vector<Outcome> runAll(const std::vector<Arguments>& commands) const;

private:
    std::unique_ptr<Process> agent_;
};

// A test with a place of its own.
class AtPlace : public testing::Test {
protected:
    void start() {
        place_.start();
        place_.useCoverageFiles();
    }

    Place place_;
};

}  // namespace vrx::end_to_end
