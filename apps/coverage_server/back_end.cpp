#include "coverage_server/back_end.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <limits>
#include <system_error>
#include <utility>

#include "coverage_server/threads.h"

namespace vrx::coverage_server {

namespace {

constexpr const char* loopback = "127.0.0.1";

// A thread for each request: a few requests that are never answered would use up the library's own pool. There are
// never more threads than the relay has connections.
class ThreadEach final : public httplib::TaskQueue {
public:
    // Void in older releases of the library; in newer ones a bool, whether the task was accepted.
    using Taken = decltype(std::declval<httplib::TaskQueue&>().enqueue(nullptr));

    Taken enqueue(std::function<void()> task) override {
        while (!threads_.start(task)) std::this_thread::sleep_for(Milliseconds(10));
        return Taken(true);
    }
    void shutdown() override { threads_.wait(); }

private:
    Threads threads_{std::numeric_limits<std::size_t>::max()};
};

// A connection to a port of this machine.
class LoopbackSocket {
public:
    explicit LoopbackSocket(int port) : socket_(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        address.sin_port = htons(static_cast<std::uint16_t>(port));
        socklen_t size = sizeof address;
        auto* const generic = reinterpret_cast<sockaddr*>(&address);
        if (connect(socket_, generic, size) == 0 && getsockname(socket_, generic, &size) == 0)
            ownPort_ = ntohs(address.sin_port);
    }
    ~LoopbackSocket() {
        if (socket_ >= 0) close(socket_);
    }
    LoopbackSocket(const LoopbackSocket&) = delete;
    LoopbackSocket& operator=(const LoopbackSocket&) = delete;

    // Negative when there is no connection.
    int ownPort() const { return ownPort_; }

    // The other side may close before it has taken everything.
    void send(std::string_view bytes) const {
        while (!bytes.empty()) {
            const ssize_t count = ::send(socket_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
            if (count <= 0) return;
            bytes.remove_prefix(static_cast<std::size_t>(count));
        }
    }
    std::string receiveAll() const {
        std::string all;
        std::array<char, 16 * 1024> piece;
        for (ssize_t count; (count = recv(socket_, piece.data(), piece.size(), 0)) > 0;)
            all.append(piece.data(), static_cast<std::size_t>(count));
        return all;
    }

private:
    const int socket_;
    int ownPort_ = -1;
};

bool wantsToClose(const httplib::Request& request) {
    const std::string connection = request.get_header_value("Connection");
    return connection == "close" || (request.version == "HTTP/1.0" && connection != "Keep-Alive");
}

// The relay told the client to continue before it read the body, so that the library's own word comes too late.
std::string withoutContinue(std::string answer) {
    if (answer.starts_with("HTTP/1.1 100 ")) answer.erase(0, answer.find("\r\n\r\n") + 4);
    return answer;
}

}  // namespace

BackEnd::BackEnd(HttpService& service) : service_(service) {
    using Handled = httplib::Server::HandlerResponse;
    server_.new_task_queue = [] { return new ThreadEach; };
    server_.set_keep_alive_max_count(1);
    // This handler comes before the library reads a body. It would find none: only heads are sent to it.
    server_.set_pre_routing_handler([this](const httplib::Request& head, httplib::Response& response) {
        serve(head, response);
        return Handled::Handled;
    });
    int socket = -1;
    server_.set_socket_options([&socket](socket_t made) { socket = made; });
    port_ = server_.bind_to_any_port(loopback);
    // Makes the library's queue of new connections longer. It has 5 places, and whoever finds none tries again after a
    // second.
    if (port_ < 0 || ::listen(socket, SOMAXCONN) != 0)
        throw std::system_error(errno, std::generic_category(), "cannot listen behind the relay");
    server_.set_socket_options([](socket_t) {});
    listener_ = std::thread([this] { server_.listen_after_bind(); });
    // stop() has no effect before the server runs.
    while (!server_.is_running()) std::this_thread::sleep_for(Milliseconds(1));
}

BackEnd::~BackEnd() {
    server_.stop();
    listener_.join();
}

std::string BackEnd::answer(const ClientRequest& request, Connection& connection) {
    const LoopbackSocket socket(port_);
    if (socket.ownPort() < 0) return "";
    std::unique_lock lock(mutex_);
    asked_[socket.ownPort()] = {&request, &connection};
    lock.unlock();
    socket.send(request.head);
    std::string answer = withoutContinue(socket.receiveAll());
    lock.lock();
    asked_.erase(socket.ownPort());
    return answer;
}

void BackEnd::serve(const httplib::Request& head, httplib::Response& response) {
    const std::optional<Asked> asked = this->asked(head);
    if (!asked) {
        response.status = 403;
        return;
    }
    httplib::Request request = head;
    request.body = asked->request->body;
    Connection::Exchange& exchange = asked->connection->exchange;
    exchange.isServed = true;
    exchange.isLast = wantsToClose(head);
    service_.serve(request, response, *asked->connection);
}

std::optional<BackEnd::Asked> BackEnd::asked(const httplib::Request& head) {
    std::lock_guard lock(mutex_);
    const auto found = asked_.find(head.remote_port);
    // While the relay's connection is open, nobody else can come from its address and port.
    if (head.remote_addr != loopback || found == asked_.end()) return std::nullopt;
    return found->second;
}

}  // namespace vrx::coverage_server
