// A small HTTP server on loopback, for tests of what sends requests.
#pragma once

#include <arpa/inet.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cstdlib>
#include <functional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace vrx::host {

// Answers each request of each connection on loopback with whatever the test's function makes of it; an empty answer
// keeps silent and the connection open, one of HTTP/1.0 ends with the connection.
class LoopbackServer {
public:
    using Answer = std::function<std::string(const std::string& request)>;

    explicit LoopbackServer(Answer answer) : answer_(std::move(answer)) {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t size = sizeof address;
        if (bind(listener_, reinterpret_cast<sockaddr*>(&address), size) != 0 || listen(listener_, 16) != 0) abort();
        getsockname(listener_, reinterpret_cast<sockaddr*>(&address), &size);
        port_ = ntohs(address.sin_port);
        thread_ = std::thread([this] { run(); });
    }
    ~LoopbackServer() {
        if (::write(stop_[1], "x", 1) != 1) abort();
        thread_.join();
        for (int file : {listener_, stop_[0], stop_[1]}) ::close(file);
    }

    std::string url(const std::string& path = "/") const { return "http://127.0.0.1:" + std::to_string(port_) + path; }
    int connections() const { return connections_; }

private:
    struct Connection {
        int file;
        std::string received;
    };

    void run() {
        std::vector<Connection> open;
        while (true) {
            std::vector<pollfd> files{{stop_[0], POLLIN, 0}, {listener_, POLLIN, 0}};
            for (const Connection& connection : open) files.push_back({connection.file, POLLIN, 0});
            poll(files.data(), files.size(), -1);
            if (files[0].revents) break;
            for (std::size_t i = open.size(); i-- > 0;)
                if (files[i + 2].revents && !serve(open[i])) ::close(open[i].file), open.erase(open.begin() + long(i));
            if (files[1].revents) open.push_back({accept(listener_, nullptr, nullptr), ""}), ++connections_;
        }
        for (Connection& connection : open) ::close(connection.file);
    }

    bool serve(Connection& connection) {
        std::array<char, 65536> bytes;
        const ssize_t count = recv(connection.file, bytes.data(), bytes.size(), 0);
        if (count <= 0) return false;
        connection.received.append(bytes.data(), static_cast<std::size_t>(count));
        const std::size_t end = connection.received.find("\r\n\r\n");
        if (end == std::string::npos) return true;
        const std::size_t length = connection.received.find("Content-Length: ");
        const std::size_t body = length < end ? std::stoul(connection.received.substr(length + 16)) : 0;
        if (connection.received.size() < end + 4 + body) return true;
        const std::string answer = answer_(std::exchange(connection.received, ""));
        const ssize_t sent = send(connection.file, answer.data(), answer.size(), MSG_NOSIGNAL);
        return sent == static_cast<ssize_t>(answer.size()) && !answer.starts_with("HTTP/1.0");
    }

    const Answer answer_;
    int listener_ = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    int stop_[2] = {-1, -1};
    [[maybe_unused]] int piped_ = pipe(stop_);
    int port_ = 0;
    std::atomic<int> connections_ = 0;
    std::thread thread_;
};

inline std::string answer(const std::string& status, const std::string& body, const std::string& headers = "") {
    return "HTTP/1.1 " + status + "\r\nContent-Length: " + std::to_string(body.size()) + "\r\n" + headers + "\r\n" +
           body;
}

}  // namespace vrx::host
