#include "vrx/host/account/credential_helper.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <optional>
#include <thread>
#include <utility>

#include "vrx/host/account/credentials.h"
#include "vrx/host/base/descriptor.h"
#include "vrx/host/base/files.h"
#include "vrx/host/base/text.h"
#include "vrx/platform/limits.h"
#include "vrx/platform/log.h"

namespace vrx::host {

using platform::Duration;
using platform::Error;
using platform::MaybeError;
using platform::Result;

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr std::size_t answerBytes = 64 * 1024;
// Of a helper's standard error: what is kept, which is as much as a log line shows, and what the log shows of it.
constexpr std::size_t saidBytes = platform::limits::logArgumentBytes;
constexpr std::size_t shownLines = 3;
constexpr std::size_t shownBytesOfLine = 200;

std::string questionText(const CredentialQuestion& question) {
    std::string text = "account=" + question.account + "\n";
    if (question.altDSID) text += "altdsid=" + *question.altDSID + "\n";
    return text + "service=" + question.service + "\navoid_ui=" + (question.avoidsUI ? "1" : "0") + "\n\n";
}

// A file in memory. Unlike a pipe, it never blocks the writer, however little the helper reads.
Descriptor inputFile(const std::string& text) {
    Descriptor file(memfd_create("credential-question", MFD_CLOEXEC));
    if (file && pwrite(file.number(), text.data(), text.size(), 0) != static_cast<ssize_t>(text.size()))
        return Descriptor();
    return file;
}

struct HelperPipe {
    bool open() {
        int ends[2];
        if (pipe2(ends, O_CLOEXEC) != 0) return false;
        reader = Descriptor(ends[0]);
        writer = Descriptor(ends[1]);
        return true;
    }
    Descriptor reader, writer;
};

Error cannotStart(const std::string& program, int number) {
    return credentialError(CredentialFailure::NotStarted,
                           "the credential helper " + program + " cannot be run: " + std::strerror(number));
}

constexpr std::string_view markName = "VRXAGENT_HELPER=";

std::vector<std::string> childrenOfThisProcess() {
    std::vector<std::string> identifiers;
    std::error_code error;
    std::filesystem::directory_iterator thread("/proc/self/task", error);
    for (; !error && thread != std::filesystem::directory_iterator(); thread.increment(error)) {
        std::ifstream children(thread->path() / "children");
        for (std::string identifier; children >> identifier;) identifiers.push_back(identifier);
    }
    return identifiers;
}

// Nothing while the process has no environment: it is executing another program just now, or has ended.
std::optional<bool> isMarked(const std::string& process, const std::string& mark) {
    std::ifstream file("/proc/" + process + "/environ", std::ios::binary);
    const std::string environment(std::istreambuf_iterator<char>(file), {});
    if (environment.empty()) return std::nullopt;
    return ('\0' + environment).find('\0' + mark + '\0') != environment.npos;
}

bool endChild(pid_t child) {
    if (kill(child, SIGKILL) != 0) return false;
    while (waitpid(child, nullptr, 0) < 0 && errno == EINTR) {
    }
    return true;
}

// Ends what a helper has left behind outside of its process group. Orphans become this process's children, and are
// known by the mark that they have inherited in their environment. One that hides it, or runs as another user, goes on.
// The children of those that end come next.
void endOrphans(const std::string& mark) {
    constexpr int generations = 16;
    bool mayBeMore = true;
    for (int i = 0; i < generations && std::exchange(mayBeMore, false); ++i)
        for (const std::string& child : childrenOfThisProcess()) {
            const std::optional<bool> isOfHelper = isMarked(child, mark);
            if (!isOfHelper) std::this_thread::sleep_for(std::chrono::milliseconds(1));
            mayBeMore |= !isOfHelper || (*isOfHelper && endChild(std::atoi(child.c_str())));
        }
}

// The helper and its process group, which are killed when this object is destroyed, and all that left the group.
class Helper {
public:
    Helper() = default;
    ~Helper() { end(); }
    Helper(const Helper&) = delete;
    Helper& operator=(const Helper&) = delete;

    MaybeError start(const std::vector<std::string>& command, int input, int output, int errors);
    int process() const { return process_.number(); }
    // Kills what is left of the group. Returns the helper's own status as waitpid gives it, -1 when it is unknown.
    int end();

private:
    // Tells this helper's processes from those of others.
    static std::string newMark() {
        static std::atomic<unsigned> count = 0;
        return std::string(markName) + std::to_string(getpid()) + "." + std::to_string(++count);
    }

    const std::string mark_ = newMark();
    pid_t identifier_ = -1;
    Descriptor process_;
};

// Gives the helper default signal handling, since the agent's threads have signals blocked, and none of the agent's
// other descriptors.
MaybeError Helper::start(const std::vector<std::string>& command, int input, int output, int errors) {
    posix_spawn_file_actions_t files;
    posix_spawn_file_actions_init(&files);
    posix_spawn_file_actions_adddup2(&files, input, STDIN_FILENO);
    posix_spawn_file_actions_adddup2(&files, output, STDOUT_FILENO);
    posix_spawn_file_actions_adddup2(&files, errors, STDERR_FILENO);
    posix_spawn_file_actions_addclosefrom_np(&files, STDERR_FILENO + 1);

    posix_spawnattr_t attributes;
    posix_spawnattr_init(&attributes);
    posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETPGROUP | POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
    posix_spawnattr_setpgroup(&attributes, 0);
    sigset_t signals;
    sigemptyset(&signals);
    posix_spawnattr_setsigmask(&attributes, &signals);
    sigfillset(&signals);
    posix_spawnattr_setsigdefault(&attributes, &signals);

    prctl(PR_SET_CHILD_SUBREAPER, 1, 0, 0, 0);
    std::vector<std::string> settings{mark_};
    for (const char* name : {"PATH", "HOME", "LANG"})
        if (const char* value = std::getenv(name)) settings.push_back(std::string(name) + "=" + value);
    auto pointers = [](const std::vector<std::string>& texts) {
        std::vector<char*> result;
        result.reserve(texts.size() + 1);
        for (const std::string& text : texts) result.push_back(const_cast<char*>(text.c_str()));
        result.push_back(nullptr);
        return result;
    };
    const int result = posix_spawn(&identifier_, command[0].c_str(), &files, &attributes, pointers(command).data(),
                                   pointers(settings).data());
    posix_spawnattr_destroy(&attributes);
    posix_spawn_file_actions_destroy(&files);
    if (result != 0) {
        identifier_ = -1;
        return cannotStart(command[0], result);
    }
    process_ = openProcess(identifier_);
    if (!process_) return cannotStart(command[0], errno);
    return std::nullopt;
}

int Helper::end() {
    if (identifier_ < 0) return -1;
    // Kills before waiting: until then no other process can get the helper's number. One that runs as another user
    // cannot be killed, and is not waited for.
    kill(-identifier_, SIGKILL);
    const int options = kill(identifier_, SIGKILL) == 0 ? 0 : WNOHANG;
    int status = -1;
    pid_t ended;
    do ended = waitpid(identifier_, &status, options);
    while (ended < 0 && errno == EINTR);
    identifier_ = -1;
    endOrphans(mark_);
    return ended > 0 ? status : -1;
}

// The helper's output so far.
class Answer {
public:
    explicit Answer(int file) : file_(file) { fcntl(file, F_SETFL, O_NONBLOCK); }

    // Reads what is there. Returns false once nothing more can come.
    bool read() {
        while (size_ < bytes_.bytes().size()) {
            const ssize_t count = ::read(file_, bytes_.bytes().data() + size_, bytes_.bytes().size() - size_);
            if (count < 0 && errno == EINTR) continue;
            if (count <= 0) return count < 0 && errno == EAGAIN;
            size_ += static_cast<std::size_t>(count);
        }
        return false;
    }
    int file() const { return file_; }
    bool isTooLong() const { return size_ > answerBytes; }
    std::string_view text() const { return bytes_.text().substr(0, size_); }

private:
    const int file_;
    Secret bytes_{platform::Data(answerBytes + 1)};
    std::size_t size_ = 0;
};

using Lines = std::vector<std::string_view>;

// The lines that are not empty, without their ends.
Lines linesOf(std::string_view text) {
    Lines lines;
    while (!text.empty()) {
        std::string_view line = text.substr(0, text.find('\n'));
        text.remove_prefix(std::min(line.size() + 1, text.size()));
        if (line.ends_with('\r')) line.remove_suffix(1);
        if (!line.empty()) lines.push_back(line);
    }
    return lines;
}

// What the helper says on its standard error. All of it is read, so that the helper never waits; the beginning is kept.
class Said {
public:
    explicit Said(int file) : file_(file) { fcntl(file, F_SETFL, O_NONBLOCK); }

    // Reads as much as a pipe holds, but no more: a helper that never stops would keep its deadline from being seen.
    // Returns false once nothing more can come.
    bool read() {
        constexpr std::size_t pipeBytes = 64 * 1024;
        for (std::size_t taken = 0; taken < pipeBytes;) {
            const ssize_t count = ::read(file_, bytes_.bytes().data() + size_, bytes_.bytes().size() - size_);
            if (count < 0 && errno == EINTR) continue;
            if (count <= 0) return count < 0 && errno == EAGAIN;
            const auto size = static_cast<std::size_t>(count), kept = std::min(size, saidBytes - size_);
            size_ += kept;
            leftOut_ += size - kept;
            taken += size;
        }
        return true;
    }
    int file() const { return file_; }
    void writeToLog(std::string_view answer) const;

private:
    const int file_;
    Secret bytes_{platform::Data(saidBytes + 4096)};  // the end takes what is not kept
    std::size_t size_ = 0;
    std::size_t leftOut_ = 0;
};

// A line that holds what the answer gives for a token, or a part of it, is replaced. The last line of those that are
// kept, which may end within the token, is dropped when more came.
void Said::writeToLog(std::string_view answer) const {
    std::string_view text = bytes_.text().substr(0, size_);
    if (leftOut_ > 0) text = text.substr(0, text.rfind('\n') + 1);
    const std::size_t leftOut = leftOut_ + size_ - text.size();
    Lines lines = linesOf(text);
    if (lines.empty() && leftOut == 0) return;
    for (const std::string_view given : linesOf(answer)) {
        const std::string_view token = given.starts_with("token=") ? trimmed(given.substr(6)) : "";
        if (token.empty()) continue;
        for (std::string_view& line : lines)
            if (line.find(token) != line.npos) line = "(a line that holds the token)";
    }

    std::string shown, all;
    for (std::size_t i = 0; i < lines.size(); ++i) {
        const char* end = i == 0 ? "" : "\n";
        all.append(end).append(lines[i]);
        const platform::BriefDescriptions brief(shownBytesOfLine);
        if (i < shownLines) shown.append(end).append(platform::describe(lines[i]));
    }
    log(platform::Level::Default, "The credential helper said, %lu of %lu lines: %{private}@",
        std::min(lines.size(), shownLines), lines.size(), shown);
    log(platform::Level::Debug, "The credential helper said, %lu bytes left out: %@", leftOut, all);
}

// Reads until the helper has ended, not until its output is closed, which its children may keep open.
MaybeError listen(const Helper& helper, Answer& answer, Said& said, Duration limit, int stopFile) {
    const SteadyClock::time_point deadline = SteadyClock::now() + std::chrono::ceil<SteadyClock::duration>(limit);
    std::array<pollfd, 4> files{
        {{helper.process(), POLLIN, 0}, {stopFile, POLLIN, 0}, {answer.file(), POLLIN, 0}, {said.file(), POLLIN, 0}}};
    while (true) {
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - SteadyClock::now()).count();
        const int ready = left > 0 ? poll(files.data(), files.size(), static_cast<int>(left)) : 0;
        if (ready < 0 && errno == EINTR) continue;
        if (ready < 0)
            return credentialError(CredentialFailure::Status,
                                   "the credential helper cannot be waited for: " + std::string(std::strerror(errno)));
        if (ready == 0) return credentialError(CredentialFailure::TimedOut, "the credential helper took too long");
        if (files[1].revents) return credentialError(CredentialFailure::Ended, "the agent is ending");
        // Before its end is noticed, what it printed is read.
        if (!answer.read()) files[2].fd = -1;
        if (!said.read()) files[3].fd = -1;
        if (answer.isTooLong())
            return credentialError(CredentialFailure::Answer, "the credential helper printed too much");
        if (files[0].revents) return std::nullopt;
    }
}

MaybeError statusError(int status) {
    std::string how;
    if (WIFSIGNALED(status))
        how = "was ended by signal " + std::to_string(WTERMSIG(status));
    else if (WEXITSTATUS(status) != 0)
        how = "failed with status " + std::to_string(WEXITSTATUS(status));
    else
        return std::nullopt;
    return credentialError(CredentialFailure::Status, "the credential helper " + how);
}

}  // namespace

Error credentialError(CredentialFailure failure, std::string text) {
    return Error{platform::error_domain::credential, static_cast<int>(failure), std::move(text)};
}

// Closes its own copies of the pipes' writing ends, so that the output ends when the helper and its children do.
Result<Secret> askCredentialHelper(const std::vector<std::string>& command, const CredentialQuestion& question,
                                   Duration limit, int stopFile) {
    const Descriptor input = inputFile(questionText(question));
    if (!input) return cannotStart(command[0], errno);
    HelperPipe output, errors;
    if (!output.open() || !errors.open()) return cannotStart(command[0], errno);
    Helper helper;
    if (MaybeError error = helper.start(command, input.number(), output.writer.number(), errors.writer.number()))
        return *error;
    output.writer = Descriptor();
    errors.writer = Descriptor();

    Answer answer(output.reader.number());
    Said said(errors.reader.number());
    MaybeError error = listen(helper, answer, said, limit, stopFile);
    if (!error) error = statusError(helper.end());
    said.writeToLog(answer.text());
    if (error) return *error;
    Result<std::string_view> token = tokenIn(answer.text());
    if (!token) return token.error();
    return Secret(platform::Data(token->begin(), token->end()));
}

Result<std::string_view> tokenIn(std::string_view answer) {
    auto wrong = [](const char* what) {
        return credentialError(CredentialFailure::Answer, std::string("the credential helper printed ") + what);
    };
    std::optional<std::string_view> token;
    while (!answer.empty()) {
        const std::string_view line = answer.substr(0, answer.find('\n'));
        answer.remove_prefix(std::min(line.size() + 1, answer.size()));
        if (line.empty()) break;
        if (line.find('=') == line.npos) return wrong("a line that is not key=value");
        if (line.starts_with("token=")) token = line.substr(6);
    }
    if (!token || token->empty()) return wrong("no token");
    if (!isToken(*token)) return wrong("a token that is too long or holds more than visible characters");
    return *token;
}

}  // namespace vrx::host
