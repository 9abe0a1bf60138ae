#include "host/restart.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <poll.h>
#include <sched.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>

#include <csignal>
#include <filesystem>
#include <map>

#include "host/home_lock.h"
#include "support.h"

namespace vrx::host {
namespace {

constexpr const char* folderVariable = "VRX_TEST_FOLDER";

Descriptor connectTo(const std::string& path) {
    Descriptor file(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof address.sun_path - 1);
    EXPECT_EQ(connect(file.number(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
    return file;
}

// What a process does in its first program, and in the second.
void runFirstProgram(const std::string& folder) {
    const Restart restart;
    HomeLock lock;
    ListeningSocket listener;
    setenv(folderVariable, folder.c_str(), 1);
    if (lock.take(folder) || listener.open(folder + "/socket")) _exit(1);
    writeFile(folder + "/first", "");
    while (!std::filesystem::exists(folder + "/connected")) sched_yield();
    std::string name = "host_tests", filter = "--gtest_filter=*DISABLED_SecondProgram";
    std::string disabled = "--gtest_also_run_disabled_tests";
    char* arguments[] = {name.data(), filter.data(), disabled.data(), nullptr};
    restart.execute(arguments, listener.release(), lock.release());
    _exit(2);
}

TEST(Restart, DISABLED_SecondProgram) {
    const char* folder = std::getenv(folderVariable);
    ASSERT_TRUE(folder);
    HomeLock lock;
    ListeningSocket listener;
    ASSERT_FALSE(lock.take(folder));
    ASSERT_FALSE(listener.open(std::string(folder) + "/socket"));
    const Descriptor client(accept(listener.number(), nullptr, nullptr));
    const std::string text = std::to_string(getpid());
    EXPECT_EQ(write(client.number(), text.data(), text.size()), static_cast<ssize_t>(text.size()));
    EXPECT_EQ(fcntl(listener.number(), F_GETFD), FD_CLOEXEC);
    char byte;
    EXPECT_EQ(read(client.number(), &byte, 1), 0);  // until the other has seen enough
}

TEST(Restart, KeepsClientsWaitingAndTheHomeLocked) {
    LogRecorder log;
    TemporaryFolder folder;
    const pid_t child = fork();
    if (child == 0) runFirstProgram(folder.path());
    while (!std::filesystem::exists(folder / "first")) std::this_thread::yield();
    Descriptor client = connectTo(folder / "socket");
    EXPECT_TRUE(HomeLock::isInUse(folder.path()));
    writeFile(folder / "connected", "");

    // The home is never free while one program takes the other's place.
    std::string answer;
    for (pollfd file{client.number(), POLLIN, 0}; poll(&file, 1, 0) == 0;) {
        ASSERT_TRUE(HomeLock::isInUse(folder.path()));
        ASSERT_TRUE(HomeLock().take(folder.path()));
    }
    char text[32];
    const ssize_t size = read(client.number(), text, sizeof text);
    ASSERT_GT(size, 0);
    EXPECT_EQ(std::string(text, static_cast<std::size_t>(size)), std::to_string(child)) << "the same process";
    client = Descriptor();
    int status = 0;
    waitpid(child, &status, 0);
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
    EXPECT_FALSE(HomeLock::isInUse(folder.path()));
    EXPECT_FALSE(std::filesystem::exists(folder / "socket")) << "it goes with the process that bound it";
}

TEST(Restart, LeavesItToAServiceManagerThatStartedThisProcess) {
    auto isUnder = [](std::map<const char*, std::string> variables) {
        for (const auto& [name, value] : variables) setenv(name, value.c_str(), 1);
        const bool result = isUnderServiceManager();
        for (const auto& [name, value] : variables) unsetenv(name);
        return result;
    };
    EXPECT_FALSE(isUnder({}));
    EXPECT_TRUE(isUnder({{"NOTIFY_SOCKET", "/run/notify"}}));
    EXPECT_TRUE(isUnder({{"INVOCATION_ID", "1"}, {"SYSTEMD_EXEC_PID", std::to_string(getpid())}}));
    EXPECT_FALSE(isUnder({{"INVOCATION_ID", "1"}, {"SYSTEMD_EXEC_PID", "1"}})) << "a shell of that service's";
    EXPECT_FALSE(isUnder({{"INVOCATION_ID", "1"}}));
}

}  // namespace
}  // namespace vrx::host
