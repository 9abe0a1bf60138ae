#include "vrx/host/restart.h"

#include <poll.h>

#include "client/raw_client.h"
#include "host/support.h"
#include "support/eventually.h"
#include "vrx/host/home/home_lock.h"

namespace vrx::host {
namespace {

constexpr const char* folderVariable = "VRX_TEST_FOLDER";

// What a process does in its first program, and in the second.
void runFirstProgram(const std::string& folder) {
    const Restart restart;
    HomeLock lock;
    ListeningSocket listener;
    setenv(folderVariable, folder.c_str(), 1);
    if (lock.take(folder) || listener.open(folder + "/socket")) _exit(1);
    writeFile(folder + "/first", "");
    if (!eventually([&] { return std::filesystem::exists(folder + "/connected"); }, "a client")) _exit(1);
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
    const pid_t child = inChild([&] { runFirstProgram(folder.path()); });
    ASSERT_TRUE(eventually([&] { return std::filesystem::exists(folder / "first"); }, "the first program"));
    test::RawClient client(folder / "socket");
    ASSERT_TRUE(client.isConnected());
    writeFile(folder / "connected", "");

    // The home is never free while one program takes the other's place.
    for (pollfd file{client.file(), POLLIN, 0}; poll(&file, 1, 0) == 0;)
        ASSERT_TRUE(HomeLock::isInUse(folder.path()) && HomeLock().take(folder.path()));
    EXPECT_TRUE(client.readUntil(std::to_string(child))) << "the same process";
    client.close();
    EXPECT_EQ(endOf(child), 0);
    EXPECT_FALSE(HomeLock::isInUse(folder.path()));
    EXPECT_FALSE(std::filesystem::exists(folder / "socket")) << "it goes with the process that bound it";
}

}  // namespace
}  // namespace vrx::host
