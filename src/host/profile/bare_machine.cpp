#include "vrx/host/profile/bare_machine.h"

#include <sys/utsname.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <initializer_list>

#include "vrx/host/base/text.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/vendor.h"

namespace vrx::host {

namespace {

using OptionalText = std::optional<std::string>;
using File = platform::Result<FileContent>;

// Placeholders that firmware gives when its maker filled in nothing count as nothing.
std::shared_ptr<const OptionalText> firmwareText(const File& file, std::shared_ptr<const OptionalText>) {
    OptionalText result;
    if (file) {
        const std::string_view text = trimmed(file->text());
        constexpr std::string_view fillers[] = {"",
                                                "0",
                                                "None",
                                                "Not Specified",
                                                "Not Applicable",
                                                "Default string",
                                                "To Be Filled By O.E.M.",
                                                "To be filled by O.E.M.",
                                                "System Serial Number",
                                                "System Product Name"};
        bool isFiller = false;
        for (std::string_view filler : fillers) isFiller = isFiller || text == filler;
        if (!isFiller) result = std::string(text);
    }
    return std::make_shared<const OptionalText>(std::move(result));
}

// The value of the first line NAME=value, without its quotation marks.
OptionalText assignment(std::string_view text, std::string_view name) {
    while (!text.empty()) {
        const std::size_t end = text.find('\n');
        std::string_view line = trimmed(text.substr(0, end));
        text = end == text.npos ? std::string_view() : text.substr(end + 1);
        if (!line.starts_with(name) || !line.substr(name.size()).starts_with('=')) continue;
        line.remove_prefix(name.size() + 1);
        if (line.size() >= 2 && (line.front() == '"' || line.front() == '\'') && line.back() == line.front())
            line = line.substr(1, line.size() - 2);
        if (!line.empty()) return std::string(line);
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
      machineId_(root + "/etc/machine-id", firmwareText),
      versionId_(root + "/etc/os-release", assignedText({"VERSION_ID"})),
      localeConf_(root + "/etc/locale.conf", assignedText({"LC_ALL", "LC_MESSAGES", "LANG"})),
      defaultLocale_(root + "/etc/default/locale", assignedText({"LC_ALL", "LC_MESSAGES", "LANG"})) {}

std::optional<std::string> BareMachine::serialNumber() const {
    if (OptionalText serial = *firmwareSerial_.get()) return serial;
    OptionalText machineId = *machineId_.get();
    if (!machineId) return std::nullopt;
    // Twelve characters, digits and capitals, like a serial number.
    std::string derived = platform::sha256Hash(platform::vendorIdentifier(platform::serviceNameRemainder) + *machineId);
    derived.resize(12);
    for (char& c : derived)
        if (c >= 'a') c = static_cast<char>(c - 'a' + 'A');
    return derived;
}

std::string BareMachine::name() const {
    return kernel().nodename;
}

std::string BareMachine::productType() const {
    return firmwareProduct_.get()->value_or(kernel().machine);
}

std::string BareMachine::productVersion() const {
    return versionId_.get()->value_or(kernel().release);
}

std::string BareMachine::localeIdentifier() const {
    for (const OptionalText& name : {*localeConf_.get(), *defaultLocale_.get(), environmentText("LC_ALL"),
                                     environmentText("LC_MESSAGES"), environmentText("LANG")})
        if (name)
            if (OptionalText identifier = localeIdentifierFromPosix(*name)) return *identifier;
    return "en_US";
}

std::optional<std::string> localeIdentifierFromPosix(std::string_view name) {
    const std::string_view identifier = name.substr(0, name.find_first_of(".@"));
    if (identifier.empty()) return std::nullopt;
    if (identifier == "C" || identifier == "POSIX") return "en_US";
    return std::string(identifier);
}

}  // namespace vrx::host
