// What the files of every host do, simulated or real.
#include "vrx/platform/files.h"

#include <gtest/gtest.h>

#include "host/support.h"
#include "vrx/host/base/files.h"
#include "vrx/platform/limits.h"
#include "vrx/sim/files.h"

namespace vrx {
namespace {

using platform::Data;

struct SimulatedFiles {
    sim::Files files;
};
struct RealFiles {
    host::TemporaryFolder folder;
    host::Files files{folder.path()};
};

template <class Subject>
class FilesContract : public testing::Test {
protected:
    std::string home(const std::string& name) const { return files.homeDirectory() + "/" + name; }

    Subject subject;
    platform::Files& files = subject.files;
};

struct Names {
    template <class Subject>
    static std::string GetName(int) {
        return std::is_same_v<Subject, SimulatedFiles> ? "Simulated" : "Real";
    }
};
using Subjects = testing::Types<SimulatedFiles, RealFiles>;
TYPED_TEST_SUITE(FilesContract, Subjects, Names);

TYPED_TEST(FilesContract, ReplaceAndReadWholeFiles) {
    EXPECT_TRUE(this->files.homeDirectory().starts_with('/'));
    EXPECT_FALSE(this->files.homeDirectory().ends_with('/'));
    const std::string path = this->home("a b.plist");
    EXPECT_FALSE(this->files.read(path));
    for (const Data& content : {Data{'l', 'o', 'n', 'g', 0}, Data{'s'}, Data{}}) {
        EXPECT_EQ(this->files.replace(path, content), std::nullopt);
        ASSERT_TRUE(this->files.read(path));
        EXPECT_EQ(*this->files.read(path), content);
    }
}

TYPED_TEST(FilesContract, ReadNoFileOverTheLimit) {
    const std::string path = this->home("large");
    EXPECT_EQ(this->files.replace(path, Data(platform::limits::fileBytes)), std::nullopt);
    EXPECT_TRUE(this->files.read(path));
    EXPECT_EQ(this->files.replace(path, Data(platform::limits::fileBytes + 1)), std::nullopt);
    EXPECT_FALSE(this->files.read(path));
}

TYPED_TEST(FilesContract, MakeDirectoriesAndAcceptThoseThatExist) {
    const std::string path = this->home("a/b/file");
    EXPECT_TRUE(this->files.replace(path, {})) << "the directory must exist";
    EXPECT_EQ(this->files.createDirectories(this->home("a/b")), std::nullopt);
    EXPECT_EQ(this->files.createDirectories(this->home("a/b")), std::nullopt);
    EXPECT_EQ(this->files.createDirectories(this->home("a")), std::nullopt);
    EXPECT_EQ(this->files.replace(path, {}), std::nullopt);
    EXPECT_TRUE(this->files.read(path));

    EXPECT_TRUE(this->files.createDirectories(path)) << "a file is in the way";
    EXPECT_TRUE(this->files.createDirectories(path + "/c"));
    EXPECT_TRUE(this->files.replace(path + "/c", {}));
    EXPECT_FALSE(this->files.read(this->home("a"))) << "a directory is no file";
    EXPECT_TRUE(this->files.replace(this->home("a"), {}));
    EXPECT_TRUE(this->files.read(path));
}

TYPED_TEST(FilesContract, RemoveFilesAndEmptyDirectories) {
    const std::string path = this->home("folder/file");
    EXPECT_TRUE(this->files.remove(path));
    ASSERT_EQ(this->files.createDirectories(this->home("folder")), std::nullopt);
    ASSERT_EQ(this->files.replace(path, {}), std::nullopt);
    EXPECT_TRUE(this->files.remove(this->home("folder")));
    EXPECT_EQ(this->files.remove(path), std::nullopt);
    EXPECT_FALSE(this->files.read(path));
    EXPECT_TRUE(this->files.remove(path));
}

}  // namespace
}  // namespace vrx
