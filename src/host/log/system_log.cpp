#include "vrx/host/log/system_log.h"

#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <ctime>

#include "vrx/platform/vendor.h"

namespace vrx::host {

using platform::Level;
using platform::LogEntry;

namespace {

// Whether the file is the stream that the service manager has connected to the journal.
bool isJournalStream(int file) {
    const char* stream = std::getenv("JOURNAL_STREAM");
    struct stat status;
    if (!stream || fstat(file, &status) != 0) return false;
    return std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino) == stream;
}

// The length of the control character at that place, Unicode's second range and its line separators among them; 0 for
// any other.
std::size_t controlLength(std::string_view text, std::size_t place) {
    auto byteAt = [&](std::size_t i) { return i < text.size() ? static_cast<unsigned char>(text[i]) : 0u; };
    const unsigned first = byteAt(place), second = byteAt(place + 1), third = byteAt(place + 2);
    if (first < 0x20 || first == 0x7f) return 1;
    if (first == 0xc2 && second >= 0x80 && second < 0xa0) return 2;
    return first == 0xe2 && second == 0x80 && (third == 0xa8 || third == 0xa9) ? 3 : 0;
}

// Escapes control characters, so that an argument can neither forge a line nor steer a terminal.
void appendEscaped(std::string& line, std::string_view text) {
    static constexpr char digits[] = "0123456789abcdef";
    std::size_t begin = 0;  // of what has no control character
    for (std::size_t i = 0; i < text.size();) {
        const std::size_t length = controlLength(text, i);
        if (length == 0) {
            ++i;
            continue;
        }
        line += text.substr(begin, i - begin);
        if (text[i] == '\n') {
            line += "\\n";
        } else {
            for (const char character : text.substr(i, length)) {
                const auto byte = static_cast<unsigned char>(character);
                line.append("\\x").append({digits[byte >> 4], digits[byte & 15]});
            }
        }
        begin = i += length;
    }
    line += text.substr(begin);
}

const char* levelName(Level level) {
    switch (level) {
        case Level::Debug: return "debug";
        case Level::Default: return "default";
        case Level::Error: return "error";
    }
    return "";
}

int journalPriority(Level level) {
    switch (level) {
        case Level::Debug: return LOG_DEBUG;
        case Level::Default: return LOG_INFO;
        case Level::Error: return LOG_ERR;
    }
    return LOG_INFO;
}

std::string subsystem() {
    return platform::vendorIdentifier(platform::logSubsystemName);
}

// 2026-01-31T12:00:00.123Z
std::string timeStamp() {
    timespec now{};
    clock_gettime(CLOCK_REALTIME, &now);
    std::tm fields{};
    gmtime_r(&now.tv_sec, &fields);
    std::array<char, 40> text;
    std::size_t length = std::strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%S", &fields);
    std::string milliseconds = std::to_string(1000 + now.tv_nsec / 1'000'000).substr(1);
    return std::string(text.data(), length) + "." + milliseconds + "Z";
}

// With the fields by which people look for what went wrong.
void appendFields(std::string& lines, const LogEntry& entry) {
    lines += "MESSAGE=";
    appendEscaped(lines, entry.message());
    lines.append("\nPRIORITY=").append(std::to_string(journalPriority(entry.level)));
    lines.append("\nCODE_FILE=").append(entry.file).append("\nCODE_LINE=").append(std::to_string(entry.line));
    lines.append("\nSUBSYSTEM=").append(subsystem()).append("\nCATEGORY=").append(platform::logCategory);
    lines.append("\nSYSLOG_IDENTIFIER=").append(program_invocation_short_name).append("\n");
}

// A line of the journal's stream, which begins with its priority.
void appendStreamLine(std::string& lines, const LogEntry& entry) {
    lines.append("<").append(std::to_string(journalPriority(entry.level))).append(">");
    appendEscaped(lines, entry.message());
    lines += '\n';
}

void appendFileLine(std::string& lines, const LogEntry& entry) {
    lines.append(timeStamp()).append(" ").append(levelName(entry.level)).append(" ").append(subsystem());
    lines.append(":").append(platform::logCategory).append(" ");
    appendEscaped(lines, entry.message());
    lines += '\n';
}

}  // namespace

SystemLog::SystemLog(Level lowest, int file)
    : lowest_(lowest),
      isJournal_(isJournalStream(file)),
      writer_(file, isJournal_ ? LogWriter::Form::Journal : LogWriter::Form::Lines) {}

// Lines of a request are gathered, up to a limit and to an error.
void SystemLog::write(const LogEntry& entry) {
    constexpr std::size_t mostGathered = 16 * 1024;
    if (!isOn(entry.level)) return;
    const int saved = errno;
    const bool isError = entry.level == Level::Error;
    LogLines own;
    LogLines* const gathered = RequestScope::linesFor(writer_);
    LogLines& lines = gathered ? *gathered : own;
    lines.dropUnfinished();
    (isJournal_ ? isError ? appendFields : appendStreamLine : appendFileLine)(lines.bytes, entry);
    lines.ends.push_back(lines.bytes.size());
    if (!gathered)
        writer_.take(own);
    else if (isError || lines.bytes.size() > mostGathered)
        RequestScope::handOverLines();
    if (isError) writer_.flush();
    errno = saved;
}

}  // namespace vrx::host
