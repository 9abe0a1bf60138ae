// Stands in for the journal: takes the datagrams and the streams' lines that arrive at its sockets, and throws them
// away. At SIGUSR1 it prints how many there were.
//
//     journal_sink DATAGRAM_SOCKET STREAM_SOCKET
#include <poll.h>
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <utility>
#include <vector>

#include "peer.h"

namespace {

constexpr int headerLines = 7;  // with which a stream begins

volatile std::sig_atomic_t isAsked = 0;

int socketAt(const char* path, int type) {
    const sockaddr_un address = vrx::bench::addressOf(path);
    const int file = vrx::bench::check(socket(AF_UNIX, type | SOCK_CLOEXEC, 0), "socket");
    if (bind(file, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) vrx::bench::check(-errno, "bind");
    return file;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 3) return 2;
    std::vector<pollfd> files{{socketAt(argv[1], SOCK_DGRAM), POLLIN, 0}, {socketAt(argv[2], SOCK_STREAM), POLLIN, 0}};
    listen(files[1].fd, 128);
    signal(SIGUSR1, [](int) { isAsked = 1; });
    std::array<char, 65536> bytes;
    for (long lines = 0;;) {
        const int ready = poll(files.data(), files.size(), -1);
        if (ready < 0 && errno != EINTR) return 1;
        if (std::exchange(isAsked, 0)) {
            std::printf("%ld\n", lines);
            std::fflush(stdout);
        }
        for (std::size_t i = ready > 0 ? files.size() : 0; i-- > 0;) {
            if (files[i].revents == 0) continue;
            if (i == 1) {
                files.push_back({accept4(files[1].fd, nullptr, nullptr, SOCK_CLOEXEC), POLLIN, 0});
                lines -= headerLines;
                continue;
            }
            const ssize_t size = recv(files[i].fd, bytes.data(), bytes.size(), 0);
            if (i == 0) {
                lines += size > 0;
            } else if (size > 0) {
                lines += std::count(bytes.data(), bytes.data() + size, '\n');
            } else {
                close(files[i].fd);
                files.erase(files.begin() + static_cast<std::ptrdiff_t>(i));
            }
        }
    }
}
