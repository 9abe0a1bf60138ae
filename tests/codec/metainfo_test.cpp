// What files say of applications: metainfo, key files, and the choice among translations.
#include "vrx/codec/metainfo.h"

#include "support/values.h"
#include "vrx/codec/key_file.h"
#include "vrx/codec/translated_text.h"

namespace vrx::codec {
namespace {

TEST(TranslatedText, IsTheNearestToTheLanguage) {
    // Every text is the language that it is offered in.
    const auto nearest = [](const char* wanted, std::initializer_list<const char*> offered) {
        TranslatedText text(wanted);
        for (const char* language : offered) text.offer(language, *language ? language : "none");
        return text.nearest().value_or("null");
    };
    EXPECT_EQ(nearest("de_AT", {"", "fr", "de", "de_DE", "de-at", "de_AT"}), "de-at");
    EXPECT_EQ(nearest("de_AT", {"de_DE", "", "de.UTF-8", "de"}), "de.UTF-8");
    EXPECT_EQ(nearest("fi", {"en", "fi_FI", ""}), "none");
    EXPECT_EQ(nearest("fi", {"en"}), "null");
    EXPECT_EQ(nearest("sr_Latn_RS", {"sr", "sr_RS.UTF-8@latin", "sr@latin"}), "sr_RS.UTF-8@latin");
    EXPECT_EQ(nearest("sr_RS", {"sr@latin", "sr"}), "sr");
    EXPECT_EQ(nearest("zh-Hant_HK", {"zh", "zh_CN", "zh_TW", "zh-Hant"}), "zh-Hant");
    EXPECT_EQ(nearest("zh_Hant", {"zh", "zh_CN", "zh_TW"}), "zh_TW");
    EXPECT_EQ(nearest("zh_CN", {"zh", "zh_TW", "zh-Hans"}), "zh-Hans");
    EXPECT_EQ(nearest("", {"de", "_", "de_", ""}), "none");

    TranslatedText text("de");
    text.offer("", " two\n\t words\r\n");
    EXPECT_EQ(text.nearest(), "two words");
    for (const std::string& unusable : {std::string(" \n"), std::string("a\0b", 3), std::string("\x1b[2J"),
                                        std::string("\xff"), std::string(1025, 'x')})
        text.offer("de", unusable);
    EXPECT_EQ(text.nearest(), "two words");
}

std::string told(const std::string& document) {
    const auto metainfo = parseMetainfo({document.begin(), document.end()}, "de_DE");
    return metainfo ? metainfo->name.value_or("null") + " by " + metainfo->developer.value_or("null")
                    : metainfo.error().text;
}

TEST(Metainfo, TellsNameAndDeveloperOfTheComponentAlone) {
    const std::pair<std::string, const char*> cases[] = {
        {"<component><id>a</id><name>Viewer</name><name xml:lang='de'>Betrachter</name>"
         "<developer id='x'><name>Example &amp; Co.</name><url>u</url></developer></component>",
         "Betrachter by Example & Co."},
        {"<?xml version='1.0' encoding='ISO-8859-1'?><application><developer_name xml:lang='de'>M\xfcller"
         "</developer_name><developer_name>Miller</developer_name></application>",
         "null by M\xC3\xBCller"},
        {"<component><developer_name>Old</developer_name><developer><name>New</name></developer></component>",
         "null by New"},
        {"<component><releases><release><name>1</name></release></releases><developer><x><name>2</name></x>"
         "<name>Ex<b>3</b>ample</name></developer><provides><name>4</name></provides><name>Vie<b>5</b>wer</name>"
         "<name/></component>",
         "Viewer by Example"},
        {"<component/>", "null by null"},
        {"<components><component><name>A</name></component></components>",
         "invalid metainfo: the root is not <component>"},
        {"<!DOCTYPE c [<!ENTITY a 'ha'><!ENTITY b '&a;&a;'>]><component><name>&b;</name></component>",
         "invalid metainfo: entities are not supported"},
        {"<!DOCTYPE c SYSTEM '/etc/passwd'><component><name>&b;</name></component>",
         "invalid metainfo: entities are not supported"},
        {"<component><name>A</name>", "invalid metainfo: no element found"},
        {"", "invalid metainfo: no element found"},
    };
    for (const auto& [document, expected] : cases) EXPECT_EQ(told(document), expected) << document;
    std::string deep = "<component>";
    for (int i = 0; i < 100'000; ++i) deep += "<name>";
    for (int i = 0; i < 100'000; ++i) deep += "</name>";
    EXPECT_EQ(told(deep + "<name>A</name></component>"), "A by null");
}

TEST(KeyFile, GivesTheEntriesOfAGroupOrSaysThatItIsNone) {
    const auto entries = [](std::string_view document) {
        std::string all;
        const bool isOne = readKeyFile(document, "G", [&](std::string_view key, std::string_view value) {
            all.append(key).append(":").append(value).append(";");
        });
        return isOne ? all : "none";
    };
    EXPECT_EQ(entries("# [H]\n\n[H]\na=0\n[G]\r\na = 1 = 2 \r\n#b=3\n[G H]\na=4\n[G]\n a[de]=\\n5"),
              "a:1 = 2;a[de]:\\n5;");
    EXPECT_EQ(entries(""), "");
    for (const char* document : {"a=1\n[G]", "[G\na=1", "[]\na=1", "[G]]\na=1", "[G]\nword", "[G]\n=1", "[G] x\na=1"})
        EXPECT_EQ(entries(document), "none") << document;
}

}  // namespace
}  // namespace vrx::codec
