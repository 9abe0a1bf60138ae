// A client that writes D-Bus's bytes itself, well or badly.
#pragma once

#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstdint>
#include <cstring>
#include <string>

namespace vrx::test {

class RawClient {
public:
    explicit RawClient(const std::string& path) : file_(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        std::memcpy(address.sun_path, path.c_str(), path.size());
        isConnected_ = connect(file_, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
    }
    RawClient(RawClient&& other) noexcept : file_(std::exchange(other.file_, -1)), isConnected_(other.isConnected_) {}
    ~RawClient() { close(); }
    void close() {
        if (file_ >= 0) ::close(std::exchange(file_, -1));
    }

    int file() const { return file_; }
    bool isConnected() const { return isConnected_; }

    // False when the agent has closed.
    bool write(const std::string& bytes) {
        for (std::size_t sent = 0; sent < bytes.size();) {
            ssize_t size = send(file_, bytes.data() + sent, bytes.size() - sent, MSG_NOSIGNAL);
            if (size <= 0) return false;
            sent += static_cast<std::size_t>(size);
        }
        return true;
    }

    // Reads until the text has come or the agent closes; whether it has come.
    bool readUntil(const std::string& text) {
        while (received_.find(text) == std::string::npos) {
            char buffer[4096];
            ssize_t size = read(file_, buffer, sizeof buffer);
            if (size <= 0) return false;
            received_.append(buffer, static_cast<std::size_t>(size));
        }
        return true;
    }
    bool isClosedByAgent() { return !readUntil("\x01never\x02"); }
    const std::string& received() const { return received_; }

    static std::string authentication() {
        std::string uid = std::to_string(getuid());
        std::string hex;
        for (char digit : uid) hex += std::string("3") + digit;
        return std::string(1, '\0') + "AUTH EXTERNAL " + hex + "\r\nBEGIN\r\n";
    }

    // A call of an operation with no arguments, or with one string.
    static std::string call(const std::string& member, std::uint32_t serial, const std::string* argument = nullptr) {
        std::string fields;
        addField(fields, 1, "o", "/com/orvane/vrxagent");
        addField(fields, 2, "s", "com.orvane.VRXAgentProtocol");
        addField(fields, 3, "s", member);
        if (argument) addField(fields, 8, "g", "s");
        std::string body;
        if (argument) addString(body, *argument);
        std::string message("l\x01\x00\x01", 4);
        addNumber(message, static_cast<std::uint32_t>(body.size()));
        addNumber(message, serial);
        addNumber(message, static_cast<std::uint32_t>(fields.size()));
        message += fields;
        message.resize((message.size() + 7) / 8 * 8);
        return message + body;
    }

private:
    static void addNumber(std::string& bytes, std::uint32_t number) {
        bytes.append(reinterpret_cast<const char*>(&number), sizeof number);
    }
    static void addString(std::string& bytes, const std::string& text) {
        addNumber(bytes, static_cast<std::uint32_t>(text.size()));
        bytes += text + '\0';
    }
    static void addField(std::string& fields, char code, const std::string& type, const std::string& value) {
        fields.resize((fields.size() + 7) / 8 * 8);
        fields += std::string(1, code) + '\x01' + type + '\0';
        if (type == "g")
            fields += std::string(1, static_cast<char>(value.size())) + value + '\0';
        else
            addString(fields, value);
    }

    int file_;
    bool isConnected_ = false;
    std::string received_;
};

}  // namespace vrx::test
