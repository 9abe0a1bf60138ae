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

// Escapes control characters, those of Unicode's second range and its line separators, so that an argument can neither
// forge a line nor steer a terminal.
std::string escaped(std::string_view text) {
    std::string result;
    result.reserve(text.size());
    auto byteAt = [&](std::size_t i) { return i < text.size() ? static_cast<unsigned char>(text[i]) : 0u; };
    auto escape = [&](std::size_t at, std::size_t length) {
        static constexpr char digits[] = "0123456789abcdef";
        for (std::size_t i = at; i < at + length; ++i)
            result.append("\\x").append({digits[byteAt(i) >> 4], digits[byteAt(i) & 15]});
    };
    for (std::size_t i = 0; i < text.size();) {
        std::size_t length = 1;
        bool isHarmful = byteAt(i) < 0x20 || byteAt(i) == 0x7f;
        if (byteAt(i) == 0xc2 && byteAt(i + 1) >= 0x80 && byteAt(i + 1) < 0xa0) {
            length = 2;
            isHarmful = true;
        } else if (byteAt(i) == 0xe2 && byteAt(i + 1) == 0x80 && (byteAt(i + 2) == 0xa8 || byteAt(i + 2) == 0xa9)) {
            length = 3;
            isHarmful = true;
        }
        if (text[i] == '\n')
            result += "\\n";
        else if (isHarmful)
            escape(i, length);
        else
            result += text[i];
        i += length;
    }
    return result;
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

std::string journalRecord(const LogEntry& entry) {
    std::string record = "MESSAGE=" + escaped(entry.message());
    record.append("\nPRIORITY=").append(std::to_string(journalPriority(entry.level)));
    record.append("\nCODE_FILE=").append(entry.file).append("\nCODE_LINE=").append(std::to_string(entry.line));
    record.append("\nSUBSYSTEM=").append(subsystem()).append("\nCATEGORY=").append(platform::logCategory);
    return record.append("\nSYSLOG_IDENTIFIER=").append(program_invocation_short_name).append("\n");
}

std::string lineRecord(const LogEntry& entry) {
    return timeStamp() + " " + levelName(entry.level) + " " + subsystem() + ":" + std::string(platform::logCategory) +
           " " + escaped(entry.message()) + "\n";
}

}  // namespace

SystemLog::SystemLog(Level lowest, int file)
    : lowest_(lowest),
      isJournal_(isJournalStream(file)),
      writer_(file, isJournal_ ? LogWriter::Form::Journal : LogWriter::Form::Lines) {}

void SystemLog::write(const LogEntry& entry) {
    if (!isOn(entry.level)) return;
    const int saved = errno;
    writer_.add(isJournal_ ? journalRecord(entry) : lineRecord(entry));
    if (entry.level == Level::Error) writer_.flush();
    errno = saved;
}

}  // namespace vrx::host
