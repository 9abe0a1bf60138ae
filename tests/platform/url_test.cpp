#include "vrx/platform/url.h"

#include <gtest/gtest.h>

namespace vrx::platform {
namespace {

TEST(Url, NeedsAScheme) {
    for (const char* text : {"", "plain", "/a/path", ":x", "1a:x", "a b:x", "http://a\nb", "http://a\x7f"})
        EXPECT_FALSE(Url::parse(text)) << text;
    for (const char* text : {"http://a/", "a+b-c.1:x", "FILE:///a"}) EXPECT_EQ(Url::parse(text)->text(), text);
    EXPECT_FALSE(Url::parse(std::string_view("http://a\0b", 10)));
}

TEST(Url, GivesThePathOfALocalFileOnly) {
    const std::pair<const char*, std::optional<std::string>> cases[] = {
        {"file:///a/b", "/a/b"},         {"FILE:/a", "/a"},
        {"file://localhost/a", "/a"},    {"file:///a%20%C3%A9?query#fragment", "/a \xC3\xA9"},
        {"file:///a%2e%2E/b", "/a../b"}, {"file://elsewhere/a", std::nullopt},
        {"file:a", std::nullopt},        {"file:", std::nullopt},
        {"http://a/b", std::nullopt},    {"file:///a%2Fb", std::nullopt},
        {"file:///a%00b", std::nullopt}, {"file:///a%2", std::nullopt},
        {"file:///a%zz", std::nullopt},
    };
    for (const auto& [url, path] : cases) EXPECT_EQ(Url::parse(url)->filePath(), path) << url;
    for (const char* path : {"/a b/ü%/?#.plist", "/"}) EXPECT_EQ(Url::forFile(path).filePath(), path);
}

TEST(Url, ReplacesTheExtensionOfTheLastComponent) {
    const std::tuple<const char*, const char*, const char*> cases[] = {
        {"file:///d/Warranty.plist", "plist", "file:///d/Warranty.S.x"},
        {"file:///d.e/Warranty", "", "file:///d.e/Warranty.S.x"},
        {"file:///d/.hidden", "", "file:///d/.hidden.S.x"},
        {"file:///d/a.b.c?q=.z", "c", "file:///d/a.b.S.x?q=.z"},
        {"file:///d/a.b%20c#f.g/h.i", "b c", "file:///d/a.S.x#f.g/h.i"},
    };
    for (const auto& [text, extension, replaced] : cases) {
        Url url = *Url::parse(text);
        EXPECT_EQ(url.pathExtension(), extension) << text;
        EXPECT_EQ(url.withPathExtension("S.x").text(), replaced) << text;
    }
}

TEST(Url, LetsNoExtensionLeaveTheFolder) {
    Url url = Url::forFile("/d/Warranty.plist");
    EXPECT_EQ(url.withPathExtension("a b%2F?#.plist").filePath(), "/d/Warranty.a b%2F?#.plist");
    for (const char* hostile : {"/../../etc/passwd.plist", "../x", "a/b"})
        EXPECT_FALSE(url.withPathExtension(hostile).filePath()) << hostile;
    EXPECT_FALSE(url.withPathExtension(std::string_view("a\0b", 3)).filePath());
}

}  // namespace
}  // namespace vrx::platform
