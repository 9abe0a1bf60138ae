#include "vrx/platform/log.h"

#include <cstdio>

#include "vrx/platform/platform.h"

namespace vrx::platform {

SystemLog& systemLog() {
    return Platform::current().systemLog();
}

// Compiled formats were checked; these are never reached at run time.
void log_detail::format_has_fewer_placeholders_than_arguments() {}
void log_detail::format_has_more_placeholders_than_arguments() {}
void log_detail::format_has_an_unknown_placeholder() {}
void log_detail::argument_does_not_fit_its_placeholder() {}

std::string log_detail::roundedSeconds(Duration duration) {
    char buffer[400];  // the largest double has 309 digits before its point
    std::snprintf(buffer, sizeof buffer, "%.02f", duration.count());
    return buffer;
}

std::string LogEntry::message(bool revealPrivate) const {
    std::string text;
    std::size_t position = 0;
    for (const LogArgument& argument : arguments) {
        log_detail::Placeholder placeholder = log_detail::nextPlaceholder(format, position);
        text += format.substr(position, placeholder.begin - position);
        text += argument.redacted && !revealPrivate ? *argument.redacted : argument.text;
        position = placeholder.end;
    }
    return text.append(format.substr(position));
}

}  // namespace vrx::platform
