#include "vrx/host/profile/bare_machine.h"

#include <sys/utsname.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <initializer_list>

#include "vrx/host/base/firmware_text.h"
#include "vrx/host/base/text.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/vendor.h"

namespace vrx::host {

namespace {

using OptionalText = std::optional<std::string>;
using File = platform::Result<FileContent>;

constexpr const char* firmware = "firmware";
constexpr const char* deviceTree = "device tree";
constexpr const char* environment = "the environment";

std::shared_ptr<const OptionalText> firmwareText(const File& file, std::shared_ptr<const OptionalText>) {
    return std::make_shared<const OptionalText>(file ? meaningfulFirmwareText(file->text()) : std::nullopt);
}

// Without its quotation marks, and without the backslashes that a double one needs.
std::string unquoted(std::string_view text) {
    if (text.size() < 2 || text.back() != text.front() || (text.front() != '"' && text.front() != '\''))
        return std::string(text);
    const bool isEscaped = text.front() == '"';
    text = text.substr(1, text.size() - 2);
    std::string result;
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (isEscaped && text[i] == '\\' && i + 1 < text.size() && std::strchr("\"\\$`", text[i + 1])) ++i;
        result += text[i];
    }
    return result;
}

// The value of the first line NAME=value, without its quotation marks.
OptionalText assignment(std::string_view text, std::string_view name) {
    while (!text.empty()) {
        const std::size_t end = text.find('\n');
        std::string_view line = trimmed(text.substr(0, end));
        text = end == text.npos ? std::string_view() : text.substr(end + 1);
        if (!line.starts_with(name) || !line.substr(name.size()).starts_with('=')) continue;
        line.remove_prefix(name.size() + 1);
        if (std::string value = unquoted(line); !value.empty()) return value;
    }
    return std::nullopt;
}

// Reads the value of the first name that the file assigns one to.
auto assignedText(std::initializer_list<const char*> names) {
    return [names = std::vector<std::string>(names.begin(), names.end())](const File& file,
                                                                          std::shared_ptr<const OptionalText>) {
        OptionalText result;
        for (const std::string& name : names)
            if (file && !result) result = assignment(file->text(), name);
        return std::make_shared<const OptionalText>(std::move(result));
    };
}

OptionalText environmentText(const char* name) {
    const char* value = std::getenv(name);
    return value && *value ? OptionalText(value) : std::nullopt;
}

utsname kernel() {
    utsname names{};
    uname(&names);
    return names;
}

}  // namespace

BareMachine::BareMachine(const std::string& root)
    : firmwareSerial_(root + "/sys/class/dmi/id/product_serial", firmwareText),
      firmwareProduct_(root + "/sys/class/dmi/id/product_name", firmwareText),
      treeSerial_(root + "/sys/firmware/devicetree/base/serial-number", firmwareText),
      treeModel_(root + "/sys/firmware/devicetree/base/model", firmwareText),
      machineInfo_(root + "/etc/machine-info", assignedText({"PRETTY_HOSTNAME"})),
      machineId_(root + "/etc/machine-id", firmwareText),
      versionId_(root + "/etc/os-release", assignedText({"VERSION_ID"})),
      localeConf_(root + "/etc/locale.conf", assignedText({"LC_ALL", "LC_MESSAGES", "LANG"})),
      defaultLocale_(root + "/etc/default/locale", assignedText({"LC_ALL", "LC_MESSAGES", "LANG"})) {}

std::optional<MachineFact> BareMachine::serialNumber() const {
    if (OptionalText serial = *firmwareSerial_.get()) return MachineFact{*serial, firmware};
    if (OptionalText serial = *treeSerial_.get()) return MachineFact{*serial, deviceTree};
    return std::nullopt;
}

std::optional<MachineFact> BareMachine::derivedSerialNumber() const {
    OptionalText machineId = *machineId_.get();
    if (!machineId) return std::nullopt;
    // Twelve characters, digits and capitals, like a serial number.
    std::string derived = platform::sha256Hash(platform::vendorIdentifier(platform::serviceNameRemainder) + *machineId);
    derived.resize(12);
    for (char& c : derived)
        if (c >= 'a') c = static_cast<char>(c - 'a' + 'A');
    return MachineFact{derived, "derived from " + machineId_.path()};
}

MachineFact BareMachine::name() const {
    if (OptionalText name = *machineInfo_.get()) return {*name, machineInfo_.path()};
    return {kernel().nodename, "the host name"};
}

MachineFact BareMachine::productType() const {
    if (OptionalText product = *firmwareProduct_.get()) return {*product, firmware};
    if (OptionalText model = *treeModel_.get()) return {*model, deviceTree};
    return {kernel().machine, "the processor"};
}

MachineFact BareMachine::productVersion() const {
    if (OptionalText version = *versionId_.get()) return {*version, versionId_.path()};
    return {kernel().release, "the kernel"};
}

MachineFact BareMachine::localeIdentifier() const {
    const std::pair<OptionalText, std::string> places[] = {{*localeConf_.get(), localeConf_.path()},
                                                           {*defaultLocale_.get(), defaultLocale_.path()},
                                                           {environmentText("LC_ALL"), environment},
                                                           {environmentText("LC_MESSAGES"), environment},
                                                           {environmentText("LANG"), environment}};
    for (const auto& [name, source] : places)
        if (name)
            if (OptionalText identifier = localeIdentifierFromPosix(*name)) return {*identifier, source};
    return {"en_US", "the machine's default"};
}

std::optional<std::string> localeIdentifierFromPosix(std::string_view name) {
    const std::string_view identifier = name.substr(0, name.find_first_of(".@"));
    if (identifier.empty()) return std::nullopt;
    if (identifier == "C" || identifier == "POSIX") return "en_US";
    return std::string(identifier);
}

}  // namespace vrx::host
