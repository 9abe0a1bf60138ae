// A client that writes D-Bus's bytes itself, well or badly.
#pragma once

#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <string>
#include <vector>

#include "support/sockets.h"
#include "vrx/host/base/descriptor.h"
#include "vrx/wire/names.h"

namespace vrx::test {

class RawClient {
public:
    explicit RawClient(const std::string& path) : file_(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
        const timeval minute{60, 0};  // what does not come by then, never comes
        setsockopt(file(), SOL_SOCKET, SO_RCVTIMEO, &minute, sizeof minute);
        isConnected_ = connectTo(file(), addressOf(path));
    }
    void close() { file_ = host::Descriptor(); }

    int file() const { return file_.number(); }
    bool isConnected() const { return isConnected_; }

    // False when the agent has closed.
    bool write(const std::string& bytes) {
        for (std::size_t sent = 0; sent < bytes.size();) {
            ssize_t size = send(file(), bytes.data() + sent, bytes.size() - sent, MSG_NOSIGNAL);
            if (size <= 0) return false;
            sent += static_cast<std::size_t>(size);
        }
        return true;
    }

    // Reads until the text has come or the agent closes; whether it has come.
    bool readUntil(const std::string& text) {
        while (received_.find(text) == std::string::npos) {
            char buffer[4096];
            ssize_t size = read(file(), buffer, sizeof buffer);
            isLate_ = size < 0 && errno == EAGAIN;
            if (size <= 0) return false;
            received_.append(buffer, static_cast<std::size_t>(size));
        }
        return true;
    }
    bool isClosedByAgent() { return !readUntil("\x01never\x02") && !isLate_; }
    const std::string& received() const { return received_; }

    static std::string authentication() {
        std::string uid = std::to_string(getuid());
        std::string hex;
        for (char digit : uid) hex += std::string("3") + digit;
        return std::string(1, '\0') + "AUTH EXTERNAL " + hex + "\r\nBEGIN\r\n";
    }

    struct Field {
        char code;
        char type;
        std::string value;
    };
    // A message of the bus: its type is that of calls, signals and so on.
    static std::string message(char type, std::uint32_t serial, const std::vector<Field>& fields,
                               const std::string& body) {
        std::string header;
        for (const Field& field : fields) {
            pad(header);
            header += {field.code, '\x01', field.type, '\0'};
            if (field.type == 'g')
                header += std::string(1, static_cast<char>(field.value.size())) + field.value + '\0';
            else
                addString(header, field.value);
        }
        std::string message{'l', type, '\0', '\x01'};
        for (std::size_t number : {body.size(), std::size_t{serial}, header.size()}) addNumber(message, number);
        message += header;
        pad(message);
        return message + body;
    }
    // A call of an operation with no arguments, or with one string.
    static std::string call(const std::string& member, std::uint32_t serial, const std::string* argument = nullptr) {
        std::string body;
        if (argument) addString(body, *argument);
        return call(member, serial, argument ? "s" : "", body);
    }
    static std::string call(const std::string& member, std::uint32_t serial, const std::string& signature,
                            const std::string& body, const wire::Interface& interface = wire::agentInterface) {
        std::vector<Field> fields{{1, 'o', interface.path}, {2, 's', interface.name}, {3, 's', member}};
        if (!signature.empty()) fields.push_back({8, 'g', signature});
        return message('\x01', serial, fields, body);
    }

private:
    static void pad(std::string& bytes) { bytes.resize((bytes.size() + 7) / 8 * 8); }
    static void addNumber(std::string& bytes, std::size_t number) {
        const auto word = static_cast<std::uint32_t>(number);
        bytes.append(reinterpret_cast<const char*>(&word), sizeof word);
    }
    static void addString(std::string& bytes, const std::string& text) {
        addNumber(bytes, text.size());
        bytes += text + '\0';
    }

    host::Descriptor file_;
    bool isConnected_ = false;
    bool isLate_ = false;
    std::string received_;
};

}  // namespace vrx::test
