#include "vrx/sim/system_log.h"

#include <algorithm>

namespace vrx::sim {

using platform::LogEntry;

std::vector<std::string> SystemLog::messages(platform::Level minimum) const {
    std::vector<std::string> messages;
    for (const LogEntry& entry : entries_)
        if (entry.level >= minimum) messages.push_back(entry.message(true));
    return messages;
}

int SystemLog::count(std::string_view format) const {
    return static_cast<int>(std::ranges::count(entries_, format, &LogEntry::format));
}

std::string SystemLog::lastMessage(std::string_view format) const {
    auto entry = std::find_if(entries_.rbegin(), entries_.rend(), [&](const auto& e) { return e.format == format; });
    return entry == entries_.rend() ? std::string() : entry->message(true);
}

}  // namespace vrx::sim
