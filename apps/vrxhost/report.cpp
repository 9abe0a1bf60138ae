// vrxhost report: what somebody needs who looks into a fault from afar, in one file, without what tells who the user
// is.
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <map>
#include <memory>
#include <regex>
#include <utility>

#include "vrx/codec/digest.h"
#include "vrx/host/base/descriptor.h"
#include "vrxhost/home.h"
#include "vrxhost/verbs.h"

namespace vrx::apps {

using platform::Value;

namespace {

constexpr std::size_t mostLog = std::size_t{4} << 20;

// What to put in the place of which text.
using Redactions = std::map<std::string, std::string, std::greater<>>;

// The same text is the same hash everywhere, so that one device can still be told from another.
std::string hashed(const char* what, const std::string& text) {
    const auto digest = codec::sha256(text);
    std::array<char, 8> hash{};
    std::snprintf(hash.data(), hash.size(), "%02x%02x%02x", digest[0], digest[1], digest[2]);
    return "<" + std::string(what) + " " + hash.data() + ">";
}

Redactions redactionsFrom(const Value& profile) {
    Redactions redactions;
    const platform::Array* keys = profile["keys"].asArray();
    if (!keys) return redactions;
    for (const Value& entry : *keys) {
        const std::string *key = entry["key"].asString(), *value = entry["value"].asString();
        if (!key || !value || value->size() < 3) continue;
        const std::string text = printable(*value);  // as it is shown
        if (key->ends_with(".serial_number")) redactions[text] = hashed("serial number", text);
        if (key->starts_with("account.")) redactions[text] = hashed("account", text);
        if (*key == "device.name" || (key->starts_with("watches[") && key->ends_with("].name")))
            redactions[text] = hashed("name", text);
    }
    return redactions;
}

// Longer texts first: one may hold another.
std::string redacted(std::string text, const Redactions& redactions) {
    std::vector<std::pair<std::string, std::string>> byLength(redactions.begin(), redactions.end());
    std::ranges::stable_sort(byLength, std::ranges::greater(), [](const auto& entry) { return entry.first.size(); });
    for (const auto& [secret, placeholder] : byLength)
        for (std::size_t at = 0; (at = text.find(secret, at)) != std::string::npos; at += placeholder.size())
            text.replace(at, secret.size(), placeholder);
    // Also what the profile does not know: addresses of e-mail, credentials in URLs, and whatever calls itself a token.
    static const std::regex address(R"([A-Za-z0-9._%+-]+@[A-Za-z0-9.-]+\.[A-Za-z]{2,})");
    static const std::regex credentials(R"(://[^/@ \n]+@)");
    static const std::regex token(
        R"(((?:token|password|secret|authorization|bearer)["']?[=: ]+["']?)[A-Za-z0-9+/=_.-]{6,})", std::regex::icase);
    text = std::regex_replace(text, credentials, "://<hidden>@");
    text = std::regex_replace(text, address, "<address>");
    return std::regex_replace(text, token, "$1<hidden>");
}

// The last day's; empty without a journal.
std::string journal() {
    const std::unique_ptr<FILE, int (*)(FILE*)> lines(
        popen("journalctl --no-pager --quiet --output=short-iso --since=-1d _COMM=vrxagent 2>/dev/null", "re"), pclose);
    std::string text;
    std::array<char, 4096> block;
    for (std::size_t size = 0; lines && (size = std::fread(block.data(), 1, block.size(), lines.get())) > 0;) {
        text.append(block.data(), size);
        if (text.size() > mostLog) text.erase(0, text.size() - mostLog);  // the newest matters most
    }
    return text;
}

std::string part(const char* heading, const Outcome& outcome) {
    std::string text = "== " + std::string(heading) + "\n" + outcome.text;
    if (!outcome.problem.empty()) text += outcome.problem + "\n" + outcome.advice + "\n";
    return text + "\n";
}

// One that others cannot read, and in place of none that is there. Returns why it could not be written, or nothing.
std::string writeNew(const std::string& path, const std::string& text) {
    const host::Descriptor file(open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
    if (file.number() < 0) return path + ": " + std::strerror(errno);
    for (std::size_t written = 0; written < text.size();) {
        const ssize_t size = ::write(file.number(), text.data() + written, text.size() - written);
        if (size < 0 && errno != EINTR) return path + ": " + std::strerror(errno);
        if (size > 0) written += static_cast<std::size_t>(size);
    }
    return "";
}

Outcome report(const wire::LocationOverrides& places, const std::string& path) {
    const auto outcomeOf = [&](const char* verb, void (*add)(CommandLine&, const wire::LocationOverrides&)) {
        CommandLine line("vrxhost", "");
        add(line, places);
        return line.outcomeOf(verb);
    };
    const bool isTerminal = std::exchange(presentation().isAtTerminal, false);
    const bool hasColours = std::exchange(presentation().hasColours, false);
    const Outcome profile = outcomeOf("profile", addProfileVerb);
    std::string text = "vrxagent " VRX_VERSION "\n\n" + part("doctor", outcomeOf("doctor", addDoctorVerb)) +
                       part("activities", outcomeOf("activities", addActivitiesVerb)) + part("profile", profile);
    presentation().isAtTerminal = isTerminal;
    presentation().hasColours = hasColours;
    const std::string log = journal();
    text += "== log of the last day\n" + (log.empty() ? "There is none that this user may read.\n" : log);
    if (profile.document.empty())
        return failed(profile.code, profile.problem,
                      "Without the profile it is not known what to hide, so nothing is written. " + profile.advice);
    text = redacted(std::move(text), redactionsFrom(profile.document));
    if (const std::string problem = writeNew(path, text); !problem.empty())
        return failed(ExitCode::NoAnswer, "the report cannot be written to " + problem,
                      "Name a file that is not there yet, in a folder that you can write.", "not-written");
    return {.document = {{"path", path}},
            .text = "Written to " + printable(path) +
                    ". Serial numbers, names, accounts and tokens are hidden; look it through before you send it.\n"};
}

}  // namespace

void addReportVerb(CommandLine& line, const wire::LocationOverrides& places) {
    auto path = std::make_shared<std::string>();
    line.add("report", "Writes a file for a bug report: doctor, activities, profile and log, with identities hidden",
             [&places, path] { return report(places, *path); })
        ->add_option("FILE", *path, "The file to write, which must not be there yet")
        ->required();
}

}  // namespace vrx::apps
