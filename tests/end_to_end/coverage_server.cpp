#include "end_to_end/coverage_server.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cstdio>

#include "vrx/codec/json.h"

namespace vrx::end_to_end {

using platform::Value;

CoverageServer::CoverageServer(const std::string& folder, const Arguments& arguments) {
    std::array<int, 2> ends{};
    EXPECT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
    process_.emplace(folder, VRX_PROGRAMS "/vrx-coverage-server", arguments, Arguments{},
                     Process::Handed{.output = ends[1], .listeningSocket = -1});
    close(ends[1]);
    std::FILE* output = fdopen(ends[0], "r");
    std::array<char, 200> line{}, address{};
    while (url_.empty() && std::fgets(line.data(), line.size(), output)) {
        if (std::sscanf(line.data(), "listening on %199s", address.data()) == 1) url_ = address.data();
        std::sscanf(line.data(), "control on http://127.0.0.1:%d", &controlPort_);
    }
    std::fclose(output);
    EXPECT_FALSE(url_.empty()) << process_->errors();
}

Value CoverageServer::ask(const std::string& method, const std::string& path, const std::string& body) const {
    const int connection = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    address.sin_port = htons(static_cast<std::uint16_t>(controlPort_));
    EXPECT_EQ(connect(connection, reinterpret_cast<sockaddr*>(&address), sizeof address), 0);
    const std::string request =
        method + " " + path +
        " HTTP/1.1\r\nHost: localhost\r\nConnection: close\r\nContent-Length: " + std::to_string(body.size()) +
        "\r\n\r\n" + body;
    EXPECT_EQ(send(connection, request.data(), request.size(), MSG_NOSIGNAL), std::ssize(request));
    std::string answer;
    std::array<char, 4096> piece;
    for (ssize_t count; (count = recv(connection, piece.data(), piece.size(), 0)) > 0;)
        answer.append(piece.data(), static_cast<std::size_t>(count));
    close(connection);
    EXPECT_TRUE(answer.starts_with("HTTP/1.1 20")) << path << ": " << answer;
    return codec::parseJson(answer.substr(answer.find("\r\n\r\n") + 4)).value();
}

std::string CoverageServer::requests(std::ptrdiff_t count) const {
    constexpr std::string_view origin = "renewed-";
    const Value seen = ask("GET", "/requests?atLeast=" + std::to_string(count));
    std::string text;
    for (const Value& request : *seen.asArray()) {
        if (!text.empty()) text += " ";
        if (request["path"].asString()->starts_with("/moved")) text += "moved-";
        text += request["endpoint"].asString()->front();
        if (const std::string* token = request["headers"]["X-Orvane-KS-Token"].asString())
            text += token->substr(token->find(origin) + origin.size(), 1) + ":";
        text += std::to_string(*request["status"].asInteger());
        if (request["headers"]["Cache-Control"] == Value("no-cache")) text += "!";
    }
    return text;
}

}  // namespace vrx::end_to_end
