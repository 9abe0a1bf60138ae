#include "vrx/host/base/files.h"

#include <sys/stat.h>

#include <thread>

#include "host/call_faults.h"
#include "host/support.h"

namespace vrx::host {
namespace {

std::ptrdiff_t openFiles() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
}

void replaceFileWithFailures(bool isForGood) {
    for (int k = 1, unnoticed = 0;; ++k) {
        SCOPED_TRACE("call " + std::to_string(k));
        TemporaryFolder folder;
        const std::string path = folder / "file";
        ASSERT_FALSE(replaceFile(path, bytes("old content")));
        const std::ptrdiff_t open = openFiles();
        CallFaults::fail(CallFaults::Kind::Call, k, isForGood);
        const MaybeError error = replaceFile(path, bytes("new content"));
        const bool hasFailed = CallFaults::end();
        EXPECT_EQ(openFiles(), open);
        if (!error) {
            EXPECT_EQ(fileText(path), "new content");
            if (hasFailed) {
                ASSERT_LE(++unnoticed, 2) << "more than the closings of file and folder, at the end";
                continue;
            }
            ASSERT_GT(k, 8);
            return;
        }
        EXPECT_EQ(error->code, EIO);
        const bool isReplaced = error->text.starts_with("cannot sync " + folder.path() + ":");
        EXPECT_EQ(fileText(path), isReplaced ? "new content" : "old content") << error->text;
        // What could not be removed is taken over by the next writer.
        ASSERT_FALSE(replaceFile(path, bytes("x")));
        EXPECT_EQ(fileText(path), "x");
        EXPECT_THAT(folder.names(), ElementsAre("file"));
    }
}

TEST(ReplaceFile, LeavesTheOldContentWhenACallFailsOrAllAfterItToo) {
    for (const bool isForGood : {false, true}) replaceFileWithFailures(isForGood);
}

TEST(ReplaceFile, WritersAtOnceEachLeaveAWholeFile) {
    TemporaryFolder folder;
    const std::string path = folder / "file";
    ASSERT_FALSE(replaceFile(path, bytes(std::string(20000, 'a'))));
    std::vector<std::thread> writers;
    for (char c : {'a', 'b', 'c'})
        writers.emplace_back([&path, c] {
            for (int i = 0; i < 30; ++i) EXPECT_FALSE(replaceFile(path, bytes(std::string(20000, c))));
        });
    for (int i = 0; i < 100; ++i) {
        auto content = readFile(path);
        ASSERT_TRUE(content) << content.error().text;
        ASSERT_EQ(content->bytes, Data(20000, content->bytes[0]));
    }
    for (std::thread& writer : writers) writer.join();
    EXPECT_THAT(folder.names(), ElementsAre("file"));
}

TEST(Files, AreForTheirUserAloneAndReadOnlyWhereTheyAreRegular) {
    TemporaryFolder folder;
    Files files(folder / "home");
    ASSERT_FALSE(files.createDirectories(folder / "home/a"));
    ASSERT_FALSE(files.replace(folder / "home/a/file", bytes("x")));
    EXPECT_EQ(modeOf(folder / "home/a"), 0700u);
    EXPECT_EQ(modeOf(folder / "home/a/file"), 0600u);
    ASSERT_EQ(mkfifo((folder / "fifo").c_str(), 0600), 0);
    EXPECT_FALSE(readFile(folder / "fifo"));
    EXPECT_GT(readFile("/proc/self/status")->bytes.size(), 100u) << "it has no size";
}

TEST(Files, KeepWhatTheyDecodedForAsLongAsTheFileIsTheSame) {
    const TemporaryFolder folder;
    const std::string path = folder / "file";
    const Files files(folder.path());
    const auto put = [&](const std::string& word) {
        std::ofstream(path) << "<plist><string>" + word + "</string></plist>";
        constexpr timespec longAgo[2] = {{1, 0}, {1, 0}};
        utimensat(AT_FDCWD, path.c_str(), longAgo, 0);
    };
    const auto isRead = [&](const platform::Value& word) {
        const auto root = files.readPropertyList(path);
        return (root ? *root : platform::Value()) == word;
    };
    put("one");
    EXPECT_TRUE(isRead("one"));
    put("two");  // of the same size, times and inode, but for the time of the change
    EXPECT_TRUE(isRead("two"));
    while (!FileStamp::of(path).isSettled()) std::this_thread::yield();
    const auto first = files.readPropertyList(path), second = files.readPropertyList(path);
    ASSERT_TRUE(first && second);
    EXPECT_EQ(first->asString(), second->asString()) << "both share what was decoded once";
    EXPECT_TRUE(isRead("two"));
    put("six");
    EXPECT_TRUE(isRead("six"));
    put("<");
    EXPECT_TRUE(isRead(nullptr));
    ASSERT_EQ(unlink(path.c_str()), 0);
    EXPECT_TRUE(isRead(nullptr));
}

}  // namespace
}  // namespace vrx::host
