#include "settings/words.h"

#include <libintl.h>
#include <unistd.h>

#include <algorithm>
#include <clocale>
#include <ctime>
#include <filesystem>

#include "common/agent_place.h"

namespace vrx::settings {

namespace {

constexpr const char* domain = "vrx-settings";

// The form of a date goes with the names of the months, so it is looked up in the catalogue of that category.
const char* dayFormat() {
    // Translators: a date for strftime(3), as in "June 30, 2030".
    return dcgettext(domain, "%B %-d, %Y", LC_TIME);
}

}  // namespace

void useTranslations() {
    std::setlocale(LC_ALL, "");
    std::error_code error;
    const auto beside = std::filesystem::read_symlink("/proc/self/exe", error).parent_path() / "locale";
    const bool isBuild = std::filesystem::is_directory(beside, error);
    bindtextdomain(domain, isBuild ? beside.c_str() : "/usr/share/locale");
    bind_textdomain_codeset(domain, "UTF-8");
    textdomain(domain);
}

const char* tr(const char* text) {
    return dgettext(domain, text);
}

std::string with(const char* format, const std::string& text) {
    std::string filled(format);
    if (const std::size_t place = filled.find("%s"); place != std::string::npos) filled.replace(place, 2, text);
    return filled;
}

std::string dayText(platform::Date date) {
    constexpr double endOfYear9999 = 253402300799;
    const auto time = static_cast<std::time_t>(std::clamp(platform::epochSeconds(date), 0.0, endOfYear9999));
    std::tm local{};
    localtime_r(&time, &local);
    char text[128];
    text[std::strftime(text, sizeof text, dayFormat(), &local)] = '\0';
    return text;
}

std::string coverageText(const Device& device) {
    if (!device.record) return tr("No coverage information");
    if (!device.record->isCovered) return tr("Not covered");
    return device.record->endDate ? with(tr("Covered until %s"), dayText(*device.record->endDate)) : tr("Covered");
}

std::string nameOf(const Device& device) {
    if (!device.name.empty()) return device.name;
    return device.isWatch ? tr("Watch") : tr("This Device");
}

Status statusOfFailure(const client::Failure& failure, const std::string& socket) {
    using enum client::Failure::Kind;
    switch (failure.kind) {
        case NotReachable:
            return {"network-offline-symbolic", tr("Coverage Service Not Running"),
                    with(tr("Nothing answers that knows the coverage of your devices. It starts with this command: %s"),
                         apps::unitCommand("start", socket))};
        case Refused:
            if (failure.refusal == client::Failure::Refusal::Limit)
                return {"system-lock-screen-symbolic", tr("Coverage Service Busy"),
                        tr("Too many programs ask it at the same time. Close some, and try again.")};
            return {"system-lock-screen-symbolic", tr("Not Allowed"),
                    with(tr("The coverage service does not answer this program. Install the package "
                            "vrxagent-settings again. The service says: %s"),
                         failure.text)};
        case TimedOut:
            return {"content-loading-symbolic", tr("No Answer Yet"),
                    tr("The coverage service takes long. It may still be downloading. Try again later.")};
        case BadReply:
        case Cancelled: break;
    }
    return {"dialog-warning-symbolic", tr("Answer Not Understood"),
            tr("The coverage service is of another release. Install the same release of both packages.")};
}

Status statusWithoutAccount() {
    return {
        "avatar-default-symbolic", tr("Not Signed In"),
        tr("Coverage is shown while you are signed in to your account on this device. Sign in, and it appears here.")};
}

Status statusWithoutRecord() {
    return {"dialog-question-symbolic", tr("No Coverage Information"),
            tr("Nothing is known yet of the coverage of this device. Connect to the Internet, and refresh.")};
}

}  // namespace vrx::settings
