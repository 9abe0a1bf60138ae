#include "vrx/host/base/files.h"

#include <gmock/gmock.h>
#include <sys/stat.h>

#include <cerrno>
#include <thread>

#include "host/support.h"

namespace vrx::host {
namespace {

using platform::Data;
using platform::MaybeError;
using ::testing::ElementsAre;

std::ptrdiff_t openFiles() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
}

// Fails the k-th call and, when it is to be for good, every one after it; clean-up calls pass, so that what is checked
// is whether they are made.
class FailingCalls final : public FileCalls {
public:
    FailingCalls(int k, bool forGood) : k_(k), forGood_(forGood) {}
    int open(const char* p, int f, mode_t m) override { return fails() ? -1 : FileCalls::open(p, f, m); }
    ssize_t write(int f, const void* b, std::size_t n) override {
        if (fails()) return -1;
        return FileCalls::write(f, b, std::min<std::size_t>(n, 3));  // short writes are ordinary
    }
    int lock(int f) override { return fails() ? -1 : FileCalls::lock(f); }
    int truncate(int f) override { return fails() ? -1 : FileCalls::truncate(f); }
    int sync(int f) override { return fails() ? -1 : FileCalls::sync(f); }
    int status(int f, struct stat* s) override { return fails() ? -1 : FileCalls::status(f, s); }
    int status(const char* p, struct stat* s) override { return fails() ? -1 : FileCalls::status(p, s); }
    int rename(const char* a, const char* b) override { return fails() ? -1 : FileCalls::rename(a, b); }
    int calls() const { return calls_; }

private:
    bool fails() {
        ++calls_;
        errno = ENOSPC;
        return calls_ == k_ || (forGood_ && calls_ > k_);
    }
    const int k_;
    const bool forGood_;
    int calls_ = 0;
};

class ReplaceFileWithFailures : public ::testing::TestWithParam<bool> {};

TEST_P(ReplaceFileWithFailures, LeavesTheOldContent) {
    for (int k = 1;; ++k) {
        SCOPED_TRACE("call " + std::to_string(k));
        TemporaryFolder folder;
        const std::string path = folder / "file";
        ASSERT_FALSE(replaceFile(path, bytes("old content")));
        const std::ptrdiff_t open = openFiles();
        FailingCalls calls(k, GetParam());
        const MaybeError error = replaceFile(path, bytes("new content"), calls);
        EXPECT_EQ(openFiles(), open);
        if (calls.calls() < k) {  // nothing failed: the last round
            ASSERT_FALSE(error);
            EXPECT_EQ(fileText(path), "new content");
            ASSERT_GT(k, 8);
            return;
        }
        ASSERT_TRUE(error);
        EXPECT_EQ(error->code, ENOSPC);
        const bool isReplaced = error->text.starts_with("cannot sync " + folder.path() + ":");
        EXPECT_EQ(fileText(path), isReplaced ? "new content" : "old content") << error->text;
        // What could not be removed is taken over by the next writer.
        ASSERT_FALSE(replaceFile(path, bytes("x")));
        EXPECT_EQ(fileText(path), "x");
        EXPECT_THAT(folder.names(), ElementsAre("file"));
    }
}

INSTANTIATE_TEST_SUITE_P(Of, ReplaceFileWithFailures, ::testing::Bool(),
                         [](const auto& forGood) { return forGood.param ? "ACallAndAllAfterIt" : "OneCall"; });

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

}  // namespace
}  // namespace vrx::host
