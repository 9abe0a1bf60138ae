#include "vrx/host/log/system_log.h"

#include <poll.h>

#include <csignal>
#include <numeric>

#include "host/support.h"
#include "vrx/host/base/lock_wait.h"

namespace vrx::host {
namespace {

using platform::Level;
using platform::LogEntry;
using ::testing::MatchesRegex;

std::string written(const LogEntry& entry, Level lowest) {
    Pipe pipe;
    SystemLog(lowest, pipe.writer.number()).write(entry);
    return pipe.rest();
}

TEST(SystemLog, WritesOneLineAnEntryOfItsLevelWhateverItsArgumentsHold) {
    LogEntry entry{Level::Error,
                   "read %@ of %{private}@",
                   {{"a\nb\r\x1b[2J\x7f\xc2\x85\xe2\x80\xa8 \xc3\xbc"}, {"SERIAL", "<private>"}},
                   "file.cpp",
                   1};
    EXPECT_THAT(written(entry, Level::Default),
                ::testing::MatchesRegex("....-..-..T..:..:..\\....Z error com\\.orvane\\.Vireo:core read "
                                        "a\\\\nb\\\\x0d\\\\x1b\\[2J\\\\x7f\\\\xc2\\\\x85\\\\xe2\\\\x80\\\\xa8 \xc3\xbc "
                                        "of <private>\n"));
    entry.level = Level::Default;
    EXPECT_EQ(written(entry, Level::Error), "");
    EXPECT_NE(written(entry, Level::Default), "");
}

// A request's lines are there before whoever waits for it can know that it goes on.
TEST(SystemLog, GathersTheLinesOfARequestUntilAnErrorAWaitOrItsEnd) {
    Pipe pipe;
    SystemLog log(Level::Default, pipe.writer.number());
    const auto write = [&](Level level, const char* text) { log.write({level, text, {}, "file.cpp", 1}); };
    const auto linesNow = [&] {
        log.flush();
        pollfd ready{pipe.reader.number(), POLLIN, 0};
        std::string text(poll(&ready, 1, 0) > 0 ? 4096 : 0, '\0');
        if (!text.empty()) text.resize(static_cast<std::size_t>(read(pipe.reader.number(), text.data(), text.size())));
        return std::ranges::count(text, '\n');
    };
    {
        const RequestScope scope;
        write(Level::Default, "one");
        write(Level::Default, "two");
        EXPECT_EQ(linesNow(), 0);
        write(Level::Error, "three");
        EXPECT_EQ(linesNow(), 3);
        write(Level::Default, "four");
        LockWait(std::chrono::seconds(1)).again();
        EXPECT_EQ(linesNow(), 1);
        write(Level::Default, "five");
        EXPECT_EQ(linesNow(), 0);
    }
    EXPECT_EQ(linesNow(), 1);
    write(Level::Default, "six");
    EXPECT_EQ(linesNow(), 1);
}

TEST(LogWriter, HasWrittenEverythingInOrderAtTheEndOfTheProcessAndAtACrash) {
    std::vector<std::string> lines;
    for (int i = 0; i < 3000; ++i) lines.push_back(std::to_string(i) + std::string(200, '.') + "\n");
    for (const int crash : {0, SIGABRT}) {
        Pipe pipe;
        const pid_t child = inChild([&] {
            pipe.reader = Descriptor();
            LogWriter writer(pipe.writer.number(), LogWriter::Form::Lines);
            const RequestScope scope;
            for (const std::string& line : lines) {
                LogLines& gathered = *RequestScope::linesFor(writer);
                gathered.bytes += line;
                gathered.ends.push_back(gathered.bytes.size());
                if (&line != &lines.back()) RequestScope::handOverLines();
            }
            if (crash != 0) raise(crash);
        });
        EXPECT_EQ(pipe.rest(), std::accumulate(lines.begin(), lines.end(), std::string()));
        EXPECT_EQ(endOf(child), -crash);
    }
}

TEST(LogWriter, IsNotStoppedByAPipeThatNobodyReads) {
    const Pipe pipe;
    const auto readAll = [&] {
        std::string text(1 << 20, '\0');
        pollfd ready{pipe.reader.number(), POLLIN, 0};
        std::size_t size = 0;
        while (poll(&ready, 1, 0) > 0)
            size += static_cast<std::size_t>(read(pipe.reader.number(), text.data() + size, text.size() - size));
        return text.substr(0, size);
    };
    LogWriter writer(pipe.writer.number(), LogWriter::Form::Lines);
    for (int i = 0; i < 4000; ++i) writer.take({std::string(99, 'x') + "\n", {100}});
    writer.flush();
    EXPECT_LT(readAll().size(), 400'000u);
    writer.take({"after\n", {6}});
    writer.flush();
    EXPECT_THAT(readAll(), MatchesRegex("\\([0-9]+ bytes of the log were left out: nobody read it\\)\nafter\n"));
    EXPECT_EQ(fcntl(pipe.writer.number(), F_GETFL) & O_NONBLOCK, 0) << "the mode is others' as well";
}

}  // namespace
}  // namespace vrx::host
