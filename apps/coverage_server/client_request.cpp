#include "coverage_server/client_request.h"

#include <strings.h>

#include <charconv>
#include <sstream>

namespace vrx::coverage_server {

namespace {

constexpr std::size_t bodyBytesAtMost = 1024 * 1024;

// The number at the beginning of the text.
std::optional<std::size_t> number(const std::string& text, int base) {
    std::size_t number = 0;
    if (std::from_chars(text.data(), text.data() + text.size(), number, base).ec != std::errc()) return std::nullopt;
    return number;
}

std::string trimmed(const std::string& text) {
    constexpr const char* blanks = " \t\r";
    const std::size_t begin = text.find_first_not_of(blanks);
    return begin == text.npos ? "" : text.substr(begin, text.find_last_not_of(blanks) + 1 - begin);
}

// The header's value; empty when it is not there.
std::string header(const std::string& head, const std::string& name) {
    const std::string begin = name + ":";
    std::istringstream lines(head);
    for (std::string line; std::getline(lines, line);)
        if (strncasecmp(line.c_str(), begin.c_str(), begin.size()) == 0) return trimmed(line.substr(begin.size()));
    return "";
}

// Reads what follows the first line.
bool readHead(Connection& connection, std::string& head) {
    // What is not HTTP is refused at once: it may never have an empty line.
    if (head.find(" HTTP/1.") == head.npos) return false;
    while (!head.ends_with("\n\r\n"))
        if (!connection.readLine(head)) return false;
    return true;
}

bool readTrailer(Connection& connection) {
    for (std::string line; line != "\r\n";) {
        line.clear();
        if (!connection.readLine(line)) return false;
    }
    return true;
}

bool readChunks(Connection& connection, std::string& body) {
    while (true) {
        std::string size, endOfLine;
        if (!connection.readLine(size)) return false;
        const std::optional<std::size_t> count = number(size, 16);
        if (count == 0u) return readTrailer(connection);
        if (!count || !connection.read(body, *count) || !connection.readLine(endOfLine)) return false;
    }
}

bool readBody(Connection& connection, const std::string& head, std::string& body) {
    const std::string length = header(head, "Content-Length");
    const bool isChunked = strcasecmp(header(head, "Transfer-Encoding").c_str(), "chunked") == 0;
    if (!isChunked && length.empty()) return true;
    if (header(head, "Expect") == "100-continue") connection.send("HTTP/1.1 100 Continue\r\n\r\n");
    if (isChunked) return readChunks(connection, body);
    const std::optional<std::size_t> count = number(length, 10);
    return count && connection.read(body, *count);
}

}  // namespace

std::optional<ClientRequest> readRequest(Connection& connection) {
    ClientRequest request;
    if (!connection.readLine(request.head)) return std::nullopt;
    if (!readHead(connection, request.head) || !readBody(connection, request.head, request.body)) request.refusal = 400;
    if (request.body.size() > bodyBytesAtMost) request.refusal = 413;
    return request;
}

}  // namespace vrx::coverage_server
