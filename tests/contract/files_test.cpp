// What the files of every host do, simulated or real.
#include "vrx/platform/files.h"

#include "contract/hosts.h"
#include "vrx/platform/limits.h"

namespace vrx {
namespace {

template <class Host>
class FilesContract : public ContractTest<Host> {
protected:
    std::string home(const std::string& name) const { return files.homeDirectory() + "/" + name; }

    platform::Files& files = this->host.files();
};
TYPED_TEST_SUITE(FilesContract, Hosts, HostNames);

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
    for (const char* name : {"a/b", "a/b", "a"})
        EXPECT_EQ(this->files.createDirectories(this->home(name)), std::nullopt);
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
