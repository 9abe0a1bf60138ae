#include "end_to_end/coverage_server.h"

#include <cstdio>

#include "support/sockets.h"
#include "vrx/codec/json.h"

namespace vrx::end_to_end {

CoverageServer::CoverageServer(const std::string& folder, const Arguments& arguments) {
    host::Pipe pipe;
    process_.emplace(folder, VRX_PROGRAMS "/vrx-coverage-server", arguments, Arguments{},
                     Handed{.output = pipe.writer.number(), .listeningSocket = -1});
    pipe.writer = host::Descriptor();
    const std::string_view address = "listening on ";
    std::ifstream lines("/dev/fd/" + std::to_string(pipe.reader.number()));
    for (std::string line; url_.empty() && std::getline(lines, line);) {
        if (line.starts_with(address)) url_ = line.substr(address.size());
        std::sscanf(line.c_str(), "control on http://127.0.0.1:%d", &controlPort_);
    }
    EXPECT_FALSE(url_.empty()) << process_->errors();
}

Value CoverageServer::ask(const std::string& method, const std::string& path, const std::string& body) const {
    const host::Descriptor connection(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    EXPECT_TRUE(connectTo(connection.number(), loopbackAddress(controlPort_)));
    const std::string request =
        method + " " + path +
        " HTTP/1.1\r\nHost: localhost\r\nConnection: close\r\nContent-Length: " + std::to_string(body.size()) +
        "\r\n\r\n" + body;
    EXPECT_EQ(send(connection.number(), request.data(), request.size(), MSG_NOSIGNAL), std::ssize(request));
    std::string answer;
    std::array<char, 4096> piece;
    for (ssize_t count; (count = recv(connection.number(), piece.data(), piece.size(), 0)) > 0;)
        answer.append(piece.data(), static_cast<std::size_t>(count));
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
