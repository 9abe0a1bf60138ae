#include "vrx/host/log/system_log.h"

#include <gmock/gmock.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>

#include "host/support.h"

namespace vrx::host {
namespace {

using platform::Level;
using platform::LogEntry;

std::string written(const LogEntry& entry, Level lowest) {
    int ends[2];
    EXPECT_EQ(pipe(ends), 0);
    SystemLog(lowest, ends[1]).write(entry);
    ::close(ends[1]);
    std::string text(4096, 0);
    const ssize_t size = ::read(ends[0], text.data(), text.size());
    ::close(ends[0]);
    text.resize(size > 0 ? static_cast<std::size_t>(size) : 0);
    return text;
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

TEST(LogWriter, WritesEverythingInOrderWhateverEndsTheProcess) {
    for (const bool isCrash : {false, true}) {
        int ends[2];
        ASSERT_EQ(pipe(ends), 0);
        const pid_t child = fork();
        if (child == 0) {
            ::close(ends[0]);
            {
                LogWriter writer(ends[1], LogWriter::Form::Lines);
                for (int i = 0; i < 3000; ++i) writer.add(std::to_string(i) + std::string(200, '.') + "\n");
                if (isCrash) raise(SIGABRT);
            }
            _exit(0);
        }
        ::close(ends[1]);
        std::string text;
        char bytes[4096];
        while (const ssize_t size = ::read(ends[0], bytes, sizeof bytes))
            if (size > 0) text.append(bytes, static_cast<std::size_t>(size));
        ::close(ends[0]);
        int status = 0;
        waitpid(child, &status, 0);
        EXPECT_EQ(WIFSIGNALED(status), isCrash);
        std::string expected;
        for (int i = 0; i < 3000; ++i) expected += std::to_string(i) + std::string(200, '.') + "\n";
        EXPECT_EQ(text, expected) << (isCrash ? "crash" : "exit");
    }
}

}  // namespace
}  // namespace vrx::host
