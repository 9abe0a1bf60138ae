// Stands in for the journal: takes the datagrams that arrive at a socket, and throws them away.
//
//     journal_sink SOCKET
#include <array>

#include "peer.h"

int main(int argc, char** argv) {
    if (argc != 2) return 2;
    const sockaddr_un address = vrx::bench::addressOf(argv[1]);
    const int file = vrx::bench::check(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0), "socket");
    if (bind(file, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) vrx::bench::check(-errno, "bind");
    std::array<char, 65536> datagram;
    while (recv(file, datagram.data(), datagram.size(), 0) >= 0) {
    }
    return 0;
}
