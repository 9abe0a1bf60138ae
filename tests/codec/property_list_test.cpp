// Property lists: round trips in both forms, hostile documents, limits, exchange with another implementation.
#include "vrx/codec/property_list.h"

#include <stdlib.h>

#include <cmath>
#include <filesystem>
#include <fstream>
#include <limits>

#include "support/values.h"
#include "vrx/platform/limits.h"

namespace vrx::codec {
namespace {

using platform::PropertyListFormat;
using platform::Result;

constexpr PropertyListFormat forms[] = {PropertyListFormat::Xml, PropertyListFormat::Binary};

Data bytes(std::string_view text) {
    return {text.begin(), text.end()};
}

Result<Value> parseXml(const std::string& content) {
    return parsePropertyList(bytes("<plist version=\"1.0\">" + content + "</plist>"));
}

TEST(PropertyList, ReadsBackWhatItWrites) {
    const Value values[] = {true, "", -1, std::numeric_limits<std::int64_t>::min(), "\t\r\n ", dateFromEpoch(2.5e11)};
    for (PropertyListFormat form : forms) {
        for (const Value& value : values)
            EXPECT_EQ(valueOf(parsePropertyList(*serializePropertyList(value, form))), value);
        const auto nan = parsePropertyList(*serializePropertyList(std::nan(""), form));
        EXPECT_TRUE(std::isnan(nan->asNumber().value_or(0)));
    }
}

TEST(PropertyList, RefusesToWriteWhatItCannotHold) {
    // And whether the binary form holds it.
    const std::pair<Value, bool> cases[] = {
        {nullptr, false},
        {Array{1, Dictionary{{"k", Array{nullptr}}}}, false},
        {"\xFF", false},
        {Dictionary{{"\xC3\xC3", 1}}, false},
        {dateFromEpoch(std::nan("")), false},
        {Value("control \x01"), true},
        {Value(std::string("\0", 1)), true},
        {Dictionary{{"\uFFFE", 1}}, true},
        {dateFromEpoch(1e12), true},
        {dateFromEpoch(1769860800.25), true},  // XML holds it to the second
    };
    for (const auto& [value, binaryHolds] : cases) {
        const auto binary = serializePropertyList(value, PropertyListFormat::Binary);
        ASSERT_EQ(static_cast<bool>(binary), binaryHolds) << value.description();
        if (binary) {
            EXPECT_EQ(valueOf(parsePropertyList(*binary)), value);
        }
        const auto xml = serializePropertyList(value, PropertyListFormat::Xml);
        EXPECT_EQ(static_cast<bool>(xml), value == Value(dateFromEpoch(1769860800.25))) << value.description();
    }
}

TEST(PropertyList, IsHeldToTheLimits) {
    using namespace platform::limits;
    Value deepest = Array{};
    for (int i = 1; i < documentDepth; ++i) deepest = Array{deepest};
    const Array many(documentValues - 1, true);
    const Array oneMore(documentValues, true);
    for (PropertyListFormat form : forms) {
        EXPECT_TRUE(parsePropertyList(*serializePropertyList(deepest, form)));
        EXPECT_FALSE(serializePropertyList(Array{deepest}, form));
        EXPECT_TRUE(parsePropertyList(*serializePropertyList(many, form)));
        EXPECT_FALSE(parsePropertyList(*serializePropertyList(oneMore, form)));
        EXPECT_FALSE(serializePropertyList(std::string(fileBytes, 'x'), form));
    }
    EXPECT_FALSE(parsePropertyList(Data(fileBytes + 1)));
    // The largest answers of a server.
    const Value wide = "é" + std::string(documentBytes - 4, 'x');
    EXPECT_EQ(parsePropertyList(*serializePropertyList(wide, PropertyListFormat::Binary)).value(), wide);
    Dictionary entries;
    for (std::size_t i = 1; i < documentValues; ++i) entries["key " + std::to_string(i)] = static_cast<double>(i) / 3;
    EXPECT_EQ(parsePropertyList(*serializePropertyList(entries, PropertyListFormat::Binary)).value(), Value(entries));
    std::string tooDeep;
    for (int i = 0; i <= documentDepth; ++i) tooDeep += "<array>";
    EXPECT_THAT(errorOf(parseXml(tooDeep)), HasSubstr("nested too deeply"));
}

TEST(PropertyList, CutAtAnyByteIsRefused) {
    const Value value = Dictionary{{"é", Array{1, 2.5, true, Data{1, 2, 3}, dateFromEpoch(0), "text", "日"}}};
    for (PropertyListFormat form : forms) {
        const Data document = *serializePropertyList(value, form);
        const std::size_t end = document.size() - (form == PropertyListFormat::Xml ? 1 : 0);  // a line feed
        for (std::size_t length = 0; length < end; ++length)
            EXPECT_FALSE(parsePropertyList(Data(document.begin(), document.begin() + static_cast<long>(length))))
                << length;
    }
}

TEST(XmlPropertyList, ReadsTheFormsOfOtherTools) {
    const std::pair<const char*, Value> contents[] = {
        {"<array><integer> 0x1F </integer><integer>-0X10</integer><integer>+5</integer></array>", Array{31, -16, 5}},
        {"<integer>18446744073709551615</integer>", 18446744073709551615.0},
        {"<integer>-9223372036854775808</integer>", std::numeric_limits<std::int64_t>::min()},
        {"<array><real>+infinity</real><real>-inf</real><real>1E3</real><real>-.5</real></array>",
         Array{std::numeric_limits<double>::infinity(), -std::numeric_limits<double>::infinity(), 1000.0, -0.5}},
        {"<data>\n\tAQ I\n\tD\n</data>", Data{1, 2, 3}},
        {"<string><![CDATA[<a> & ]]>&lt;&#233;&#x1F600;</string>", "<a> & <é😀"},
        {"<!-- note --><dict><key>k</key><true></true><key>k</key><false/></dict>", Dictionary{{"k", false}}},
        {"<date>2024-02-29T23:59:59Z</date>", dateFromEpoch(1709251199)},
        {"<string/>", ""},
    };
    for (const auto& [content, expected] : contents) EXPECT_EQ(valueOf(parseXml(content)), expected) << content;
    const std::string head =
        "<?xml version=\"1.0\" encoding=\"ISO-8859-1\"?>\n<!DOCTYPE plist PUBLIC "
        "\"-//Example//DTD PLIST 1.0//EN\" \"http://dtd.example/PropertyList-1.0.dtd\">\n";
    EXPECT_EQ(*parsePropertyList(bytes(head + "<plist><string>\xE9</string></plist>")), Value("é"));
}

TEST(XmlPropertyList, RefusesTheRestAndSaysWhere) {
    const std::pair<const char*, const char*> documents[] = {
        {"", "line 1:1"},
        {"text", "line 1:1"},
        {"<dict/>", "the root is not <plist>"},
        {"<plist>\n<true/>\n  <false/></plist>", "line 3:3: a second root value"},
        {"<plist><string>\xED\xA0\x80</string></plist>", "line 1:16"},
        {"<plist><string>&#xD800;</string></plist>", "line 1:16"},
        {"<!DOCTYPE p [<!ENTITY a 'x'>]><plist><string>&a;</string></plist>", "entities are not supported"},
        {"<!DOCTYPE p [<!ENTITY % a SYSTEM 'file:///etc/passwd'>%a;]><plist/>", "entities are not supported"},
        {"<!DOCTYPE p SYSTEM 'x.dtd'><plist><string>a&gone;b</string></plist>", "entities are not supported"},
    };
    for (const auto& [document, complaint] : documents)
        EXPECT_THAT(errorOf(parsePropertyList(bytes(document))), HasSubstr(complaint)) << document;
    const std::pair<const char*, std::vector<const char*>> contents[] = {
        {"no value", {""}},
        {"a key without a value", {"<dict><key>a</key></dict>"}},
        {"a value without a key", {"<dict><true/></dict>"}},
        {"a key out of place", {"<dict><key>a</key><key>b</key></dict>", "<key>a</key>"}},
        {"text outside of a value", {"<array>x</array>"}},
        {"an element within <string>", {"<string><b/></string>"}},
        {"an unknown element", {"<set/>", "<plist><true/></plist>"}},
        {"not a valid true", {"<true>x</true>"}},
        {"not a valid integer",
         {"<integer/>", "<integer>1.5</integer>", "<integer>--1</integer>", "<integer>18446744073709551616</integer>",
          "<integer>-9223372036854775809</integer>"}},
        {"not a valid real", {"<real>+-1</real>", "<real>one</real>"}},
        {"not a valid date", {"<date>2023-02-29T00:00:00Z</date>", "<date>2023-01-01T24:00:00Z</date>"}},
        {"not a valid data", {"<data>AQ=</data>", "<data>A===</data>", "<data>AQ==AQ==</data>"}},
    };
    for (const auto& [complaint, some] : contents)
        for (const char* content : some) EXPECT_THAT(errorOf(parseXml(content)), HasSubstr(complaint)) << content;
}

// A binary document of objects that are given as their bytes; references and offsets are two bytes wide.
Data binaryOf(const std::vector<std::string>& objects) {
    std::string document = "bplist00", table;
    for (const std::string& object : objects) {
        table += {static_cast<char>(document.size() >> 8), static_cast<char>(document.size())};
        document += object;
    }
    const std::size_t tableAt = document.size();
    document += table + std::string(6, '\0') + "\2\2" + std::string(6, '\0');
    document += {static_cast<char>(objects.size() >> 8), static_cast<char>(objects.size())};
    document += std::string(14, '\0');
    document += {static_cast<char>(tableAt >> 8), static_cast<char>(tableAt)};
    return bytes(document);
}

std::string raw(std::initializer_list<int> values) {
    return {values.begin(), values.end()};
}

TEST(BinaryPropertyList, ReadsTheObjectsOfOtherTools) {
    const std::pair<std::string, Value> objects[] = {
        {raw({0x08}), false},
        {raw({0x13, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFE}), -2},
        {raw({0x12, 0xFF, 0xFF, 0xFF, 0xFF}), 4294967295},
        {raw({0x14, 0, 0, 0, 0, 0, 0, 0, 0, 0x80, 0, 0, 0, 0, 0, 0, 0}), 9223372036854775808.0},
        {raw({0x22, 0x3F, 0, 0, 0}), 0.5},
        {raw({0x33, 0x3F, 0xE0, 0, 0, 0, 0, 0, 0}), dateFromEpoch(978307200.5)},
        {raw({0x62, 0xD8, 0x3D, 0xDE, 0x00}), "😀"},
        {raw({0x5F, 0x10, 2, 'a', 'b'}), "ab"},
        {raw({0x4F, 0x13, 0, 0, 0, 0, 0, 0, 0, 1, 9}), Data{9}},
    };
    for (const auto& [object, expected] : objects) EXPECT_EQ(valueOf(parsePropertyList(binaryOf({object}))), expected);
}

TEST(BinaryPropertyList, RefusesHostileObjectsAndSaysWhere) {
    const std::string text = "\x51k";
    using Objects = std::vector<std::string>;
    const std::pair<const char*, std::vector<Objects>> documents[] = {
        {"byte 8: nested too deeply", {{raw({0xA1, 0, 0})}}},  // holds itself
        {"nested too deeply",
         {{raw({0xA2, 0, 1, 0, 1}), raw({0xA2, 0, 0, 0, 0})},  // each holds the other
          {raw({0xD1, 0, 1, 0, 0}), text}}},
        {"byte 9: a reference to no object", {{raw({0xA1, 0, 1})}}},
        {"byte 9: a key that is no string", {{raw({0xD1, 0, 1, 0, 1}), raw({0x10, 7})}, {raw({0xD1, 0, 0, 0, 0})}}},
        {"a count beyond the document",
         {{raw({0xAF, 0x13, 0x7F, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF})},
          {raw({0xDF, 0x13, 0x80, 0, 0, 0, 0, 0, 0, 1})}}},
        {"contents that end beyond the objects", {{raw({0x4F, 0x10, 10})}, {raw({0x61, 0})}, {raw({0x13, 0, 0})}}},
        {"a broken count",
         {{raw({0x5F})}, {raw({0x5F, 0x14}) + std::string(16, '\0')}, {raw({0x5F, 0x33, 0, 0, 0, 0, 0, 0, 0, 0})}}},
        {"an integer too wide", {{raw({0x15}) + std::string(32, '\0')}}},
        {"an integer out of range", {{raw({0x14, 0, 0, 0, 0, 0, 0, 0, 1}) + std::string(8, '\0')}}},
        {"text that is not valid", {{raw({0x51, 0xE9})}, {raw({0x61, 0xD8, 0})}}},
        {"a date that is not finite", {{raw({0x33, 0x7F, 0xF0, 0, 0, 0, 0, 0, 0})}}},
        // A null, a UID, a set, and a real of two bytes.
        {"not supported", {{raw({0x00})}, {raw({0x80, 1})}, {raw({0xC1, 0, 0})}, {raw({0x21, 0, 0})}}},
    };
    for (const auto& [complaint, some] : documents)
        for (const Objects& objects : some)
            EXPECT_THAT(errorOf(parsePropertyList(binaryOf(objects))), HasSubstr(complaint)) << objects[0].size();
}

TEST(BinaryPropertyList, RefusesBrokenTrailers) {
    const Data good = binaryOf({raw({0x10, 7})});
    ASSERT_EQ(*parsePropertyList(good), Value(7));
    const std::size_t trailer = good.size() - 32;
    const std::pair<std::size_t, int> changes[] = {
        {6, '1'},                                                                    // another version
        {trailer + 6, 0},  {trailer + 6, 9},  {trailer + 7, 0},   {trailer + 7, 9},  // widths
        {trailer + 8, 1},  {trailer + 15, 2}, {trailer + 15, 0},                     // how many objects
        {trailer + 16, 1}, {trailer + 23, 1},                                        // the root
        {trailer + 24, 1}, {trailer + 31, 7}, {trailer + 31, 14},                    // the table
        {11, 200},                                                                   // the object's offset
    };
    for (const auto& [at, byte] : changes) {
        Data bad = good;
        bad[at] = static_cast<std::uint8_t>(byte);
        EXPECT_FALSE(parsePropertyList(bad)) << at << ": " << byte;
    }
}

// A few kilobytes that would unfold to billions of values, or to terabytes of text.
TEST(BinaryPropertyList, BoundsWhatSharingUnfoldsTo) {
    std::vector<std::string> tower;
    for (int level = 1; level <= 12; ++level) {
        std::string array = raw({0xAE});
        for (int i = 0; i < 14; ++i) array += raw({0, level});
        tower.push_back(array);
    }
    tower.push_back(raw({0x09}));
    EXPECT_THAT(errorOf(parsePropertyList(binaryOf(tower))), HasSubstr("too many values"));

    auto list = [](std::size_t count, int first, int step) {  // of references
        std::string array = raw({0xAF, 0x11, static_cast<int>(count >> 8), static_cast<int>(count)});
        for (std::size_t i = 0; i < count; ++i) {
            const int ref = first + step * static_cast<int>(i);
            array += raw({ref >> 8, ref});
        }
        return array;
    };
    // The same text many times is one text, but counts each time: whoever copies or prints it takes so much.
    const std::string text = raw({0x5F, 0x11, 0x40, 0}) + std::string(0x4000, 'x');
    const Value shared = valueOf(parsePropertyList(binaryOf({list(400, 1, 0), text})));
    EXPECT_EQ(shared.asArray()->front().asString(), shared.asArray()->back().asString());
    const std::string keyed = raw({0xD1, 0, 2, 0, 2});
    for (const auto& objects : {std::vector{list(10'000, 1, 0), text}, {list(300, 1, 0), keyed, text}})
        EXPECT_THAT(errorOf(parsePropertyList(binaryOf(objects))), HasSubstr("contents too large"));

    // Data that overlaps: each object's content holds the next objects.
    std::vector<std::string> overlapping = {list(3000, 1, 1)};
    for (int i = 0; i < 3000; ++i) overlapping.push_back(raw({0x4F, 0x11, 0x20, 0}));
    overlapping.push_back(std::string(0x2000, 'z'));
    EXPECT_THAT(errorOf(parsePropertyList(binaryOf(overlapping))), HasSubstr("contents too large"));
}

// Python's plistlib writes a value in both forms and compares it with what it reads from the form into which each was
// turned here.
TEST(PropertyList, IsExchangedWithAnotherImplementation) {
    std::string folder = (std::filesystem::temp_directory_path() / "plist-XXXXXX").string();
    ASSERT_NE(mkdtemp(folder.data()), nullptr);
    std::ofstream(folder + "/exchange.py") << R"(
import plistlib, datetime, sys
value = {'bool': [True, False, True], 'real': [0.5, -1e300, 5e-324, 0.1, float('inf')],
         'int': [n for b in range(64) for n in (2**b - 1, 2**b, -2**b)] + [2**64 - 2048],
         'data': [b'', b'\0', b'\1\2', bytes(range(256)), b'\x5a' * 70000], 'empty': [{}, [], '', {'': {}}],
         'date': [datetime.datetime(2026, 1, 31, 12), datetime.datetime(1, 1, 1), datetime.datetime(9999, 12, 31, 23, 59, 59)],
         'text': ['plain', '<&>"\' ]]>', ' kept \t\n space ', 'Grüße', '日本語', '😀\u07ff\ufffd', 'Grüße', 'x' * 300, 'é' * 70000],
         'ключ <&>': [[[[[[{'k': 'v'}]]]]]], 'many': {'k%d' % i: [i, 'shared', 'x' * i] for i in range(300)}}
for name, form in ('xml', plistlib.FMT_XML), ('binary', plistlib.FMT_BINARY):
    if sys.argv[1] == 'write':
        plistlib.dump(value, open(name, 'wb'), fmt=form)
    else:
        document = open(name + '.turned', 'rb').read()
        assert document.startswith(b'bplist00') == (name == 'xml')
        assert plistlib.loads(document) == value
)";
    auto python = [&](const char* step) {
        return std::system(("cd '" + folder + "' && /usr/bin/python3 exchange.py " + step).c_str());
    };
    ASSERT_EQ(python("write"), 0);
    for (PropertyListFormat turned : forms) {
        const std::string name = folder + (turned == PropertyListFormat::Binary ? "/xml" : "/binary");
        std::ifstream file(name, std::ios::binary);
        const Value value = valueOf(parsePropertyList(Data(std::istreambuf_iterator<char>(file), {})));
        const Data document = *serializePropertyList(value, turned);
        std::ofstream(name + ".turned", std::ios::binary) << std::string(document.begin(), document.end());
    }
    EXPECT_EQ(python("read"), 0);
    std::filesystem::remove_all(folder);
}

}  // namespace
}  // namespace vrx::codec
