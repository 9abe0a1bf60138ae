#include "vrx/host/log/system_log.h"

#include <gmock/gmock.h>

#include <csignal>
#include <numeric>

#include "host/support.h"

namespace vrx::host {
namespace {

using platform::Level;
using platform::LogEntry;

std::string written(const LogEntry& entry, Level lowest) {
    Pipe pipe;
    SystemLog(lowest, pipe.writer.number()).write(entry);
    return pipe.rest();
}

TEST(SystemLog, WritesOneLineAnEntryWhateverItsArgumentsHold) {
    const LogEntry entry{Level::Error,
                         "read %@ of %{private}@",
                         {{"a\nb\r\x1b[2J\x7f\xc2\x85\xe2\x80\xa8 \xc3\xbc"}, {"SERIAL", "<private>"}},
                         "file.cpp",
                         1};
    EXPECT_THAT(written(entry, Level::Default),
                ::testing::MatchesRegex("....-..-..T..:..:..\\....Z error com\\.orvane\\.Vireo:core read "
                                        "a\\\\nb\\\\x0d\\\\x1b\\[2J\\\\x7f\\\\xc2\\\\x85\\\\xe2\\\\x80\\\\xa8 \xc3\xbc "
                                        "of <private>\n"));
}

TEST(SystemLog, LeavesOutWhatIsBelowItsLevel) {
    LogEntry entry{Level::Debug, "debug", {}, "file.cpp", 1};
    EXPECT_EQ(written(entry, Level::Default), "");
    EXPECT_NE(written(entry, Level::Debug), "");
    entry.level = Level::Default;
    EXPECT_EQ(written(entry, Level::Error), "");
}

class LogWriterAtEnd : public ::testing::TestWithParam<int> {};

TEST_P(LogWriterAtEnd, HasWrittenEverythingInOrder) {
    std::vector<std::string> lines;
    for (int i = 0; i < 3000; ++i) lines.push_back(std::to_string(i) + std::string(200, '.') + "\n");
    Pipe pipe;
    const pid_t child = inChild([&] {
        pipe.reader = Descriptor();
        LogWriter writer(pipe.writer.number(), LogWriter::Form::Lines);
        for (const std::string& line : lines) writer.add(line);
        if (GetParam() != 0) raise(GetParam());
    });
    EXPECT_EQ(pipe.rest(), std::accumulate(lines.begin(), lines.end(), std::string()));
    EXPECT_EQ(endOf(child), -GetParam());
}

INSTANTIATE_TEST_SUITE_P(Of, LogWriterAtEnd, ::testing::Values(0, SIGABRT),
                         [](const auto& signal) { return signal.param == 0 ? "TheProcess" : "ACrash"; });

}  // namespace
}  // namespace vrx::host
