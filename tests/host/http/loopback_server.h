// A small HTTP server on loopback, for tests of what sends requests.
#pragma once

#include <poll.h>

#include <array>
#include <atomic>
#include <cstdlib>
#include <functional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "host/support.h"
#include "support/sockets.h"

namespace vrx::host {

// Answers each request of each connection on loopback with whatever the test's function makes of it; an empty answer
// keeps silent and the connection open, one of HTTP/1.0 ends with the connection.
class LoopbackServer {
public:
    using Answer = std::function<std::string(const std::string& request)>;

    explicit LoopbackServer(Answer answer) : answer_(std::move(answer)) {
        sockaddr_in address = loopbackAddress();
        socklen_t size = sizeof address;
        const int listener = listener_.number();
        if (bind(listener, reinterpret_cast<sockaddr*>(&address), size) != 0 || listen(listener, 16) != 0) abort();
        getsockname(listener, reinterpret_cast<sockaddr*>(&address), &size);
        port_ = ntohs(address.sin_port);
        thread_ = std::thread([this] { run(); });
    }
    ~LoopbackServer() {
        stop_.writer = Descriptor();
        thread_.join();
    }

    std::string url(const std::string& path = "/") const { return "http://127.0.0.1:" + std::to_string(port_) + path; }
    int connections() const { return connections_; }

private:
    struct Connection {
        Descriptor file;
        std::string received;
    };

    void run() {
        std::vector<Connection> open;
        while (true) {
            std::vector<pollfd> files{{stop_.reader.number(), POLLIN, 0}, {listener_.number(), POLLIN, 0}};
            for (const Connection& connection : open) files.push_back({connection.file.number(), POLLIN, 0});
            poll(files.data(), files.size(), -1);
            if (files[0].revents) return;
            for (std::size_t i = open.size(); i-- > 0;)
                if (files[i + 2].revents && !serve(open[i])) open.erase(open.begin() + long(i));
            if (!files[1].revents) continue;
            open.push_back({Descriptor(accept(listener_.number(), nullptr, nullptr)), ""});
            ++connections_;
        }
    }

    bool serve(Connection& connection) {
        std::array<char, 65536> bytes;
        const ssize_t count = recv(connection.file.number(), bytes.data(), bytes.size(), 0);
        if (count <= 0) return false;
        connection.received.append(bytes.data(), static_cast<std::size_t>(count));
        const std::size_t end = connection.received.find("\r\n\r\n");
        if (end == std::string::npos) return true;
        const std::size_t length = connection.received.find("Content-Length: ");
        const std::size_t body = length < end ? std::stoul(connection.received.substr(length + 16)) : 0;
        if (connection.received.size() < end + 4 + body) return true;
        const std::string answer = answer_(std::exchange(connection.received, ""));
        const ssize_t sent = send(connection.file.number(), answer.data(), answer.size(), MSG_NOSIGNAL);
        return sent == static_cast<ssize_t>(answer.size()) && !answer.starts_with("HTTP/1.0");
    }

    const Answer answer_;
    const Descriptor listener_{socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)};
    Pipe stop_;
    int port_ = 0;
    std::atomic<int> connections_ = 0;
    std::thread thread_;
};

inline std::string answer(const std::string& status, const std::string& body, const std::string& headers = "") {
    return "HTTP/1.1 " + status + "\r\nContent-Length: " + std::to_string(body.size()) + "\r\n" + headers + "\r\n" +
           body;
}

}  // namespace vrx::host
