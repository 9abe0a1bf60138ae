// Calls a server over and over and prints how long the calls took, in microseconds.
//
//     measure SOCKET CONNECTIONS CALLS [OPERATION]
//                                            CALLS of each connection; connections call side by side; the operation is
//                                            lookup, all or pending
//     measure --first SOCKET PROGRAM ARGS…   runs the program until it answers a first call, and ends it
//     measure --run FILE PROGRAM ARGS…       runs the program to its end, and fdatasync on the file after it, if any
#include <fcntl.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <thread>
#include <vector>

#include "peer.h"

namespace {

using Clock = std::chrono::steady_clock;

double microsecondsSince(Clock::time_point start) {
    return std::chrono::duration<double, std::micro>(Clock::now() - start).count();
}

using Call = sd_bus_message* (*)(sd_bus*);

std::vector<double> callTimes(const std::string& socket, int calls, Call call) {
    sd_bus* bus = vrx::bench::connectTo(socket);
    sd_bus_message_unref(call(bus));
    std::vector<double> times;
    times.reserve(static_cast<std::size_t>(calls));
    for (int i = 0; i < calls; ++i) {
        const auto start = Clock::now();
        sd_bus_message_unref(call(bus));
        times.push_back(microsecondsSince(start));
    }
    sd_bus_flush_close_unref(bus);
    return times;
}

int measure(const std::string& socket, int connections, int calls, Call call) {
    std::vector<std::vector<double>> times(static_cast<std::size_t>(connections));
    std::vector<std::thread> threads;
    const auto start = Clock::now();
    for (auto& own : times) threads.emplace_back([&] { own = callTimes(socket, calls, call); });
    for (auto& thread : threads) thread.join();
    const double total = microsecondsSince(start);
    std::vector<double> all;
    for (const auto& own : times) all.insert(all.end(), own.begin(), own.end());
    std::sort(all.begin(), all.end());
    auto percentile = [&](std::size_t percent) { return all[all.size() * percent / 100]; };
    std::printf("%.1f %.1f %.0f\n", percentile(50), percentile(99), static_cast<double>(all.size()) * 1e6 / total);
    return 0;
}

// The program's socket is there once it can be connected to.
int measureFirst(const std::string& socket, char** program) {
    const sockaddr_un address = vrx::bench::addressOf(socket);
    const auto start = Clock::now();
    const pid_t child = fork();
    if (child == 0) {
        execv(program[0], program);
        _exit(127);
    }
    while (true) {
        const int file = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
        const bool isThere = connect(file, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
        close(file);
        if (isThere) break;
        if (waitpid(child, nullptr, WNOHANG) == child) return 1;
        std::this_thread::yield();
    }
    sd_bus* bus = vrx::bench::connectTo(socket);
    sd_bus_message_unref(vrx::bench::lookUp(bus));
    std::printf("%.0f\n", microsecondsSince(start));
    sd_bus_flush_close_unref(bus);
    kill(child, SIGTERM);
    waitpid(child, nullptr, 0);
    return 0;
}

int measureRun(const std::string& synced, char** program) {
    const auto start = Clock::now();
    const pid_t child = fork();
    if (child == 0) {
        const int nowhere = open("/dev/null", O_WRONLY);
        dup2(nowhere, 1);
        execv(program[0], program);
        _exit(127);
    }
    int status = 0;
    waitpid(child, &status, 0);
    if (!synced.empty()) {
        const int file = open(synced.c_str(), O_WRONLY | O_CREAT, 0600);
        vrx::bench::check(write(file, "x", 1) == 1 && fdatasync(file) == 0 ? 0 : -errno, "fdatasync");
    }
    std::printf("%.0f\n", microsecondsSince(start));
    return status == 0 ? 0 : 1;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc > 3 && std::string(argv[1]) == "--first") return measureFirst(argv[2], argv + 3);
    if (argc > 3 && std::string(argv[1]) == "--run") return measureRun(argv[2], argv + 3);
    if (argc < 4) return 2;
    const std::string operation = argc > 4 ? argv[4] : "lookup";
    return measure(argv[1], std::atoi(argv[2]), std::atoi(argv[3]),
                   operation == "all"       ? vrx::bench::lookUpAll
                   : operation == "pending" ? vrx::bench::askForFollowUps
                                            : vrx::bench::lookUp);
}
