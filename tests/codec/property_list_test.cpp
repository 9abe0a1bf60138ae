// Property lists: round trips in both forms, hostile documents, limits, and exchange with another implementation.
#include "codec/property_list.h"

#include <gtest/gtest.h>
#include <stdlib.h>

#include <cmath>
#include <filesystem>
#include <fstream>
#include <limits>

#include "platform/limits.h"

namespace vrx::codec {
namespace {

using platform::Array;
using platform::Data;
using platform::dateFromEpoch;
using platform::Dictionary;
using platform::PropertyListFormat;
using platform::Result;
using platform::Value;

constexpr PropertyListFormat forms[] = {PropertyListFormat::Xml, PropertyListFormat::Binary};

Data bytes(std::string_view text) {
    return {text.begin(), text.end()};
}

Result<Value> parseXml(const std::string& content) {
    return parsePropertyList(bytes("<plist version=\"1.0\">" + content + "</plist>"));
}

// A value that both forms and every implementation can hold.
Value everything() {
    Array integers;
    for (int bit = 0; bit < 63; ++bit) {
        const std::int64_t power = std::int64_t{1} << bit;
        for (std::int64_t integer : {power - 1, power, -power}) integers.push_back(integer);
    }
    integers.push_back(std::numeric_limits<std::int64_t>::max());
    integers.push_back(std::numeric_limits<std::int64_t>::min());
    Dictionary many;  // more than 256 objects, and counts that take two bytes
    for (int i = 0; i < 400; ++i) many["key " + std::to_string(i)] = Array{i, "shared", std::to_string(i)};
    Value deep = "core";
    for (int i = 0; i < 15; ++i) deep = i % 2 ? Value(Array{deep}) : Value(Dictionary{{"in", deep}});
    return Dictionary{
        {"booleans", Array{true, false, true}},
        {"integers", integers},
        {"reals", Array{0.0, -0.5, 0.1, 1e300, 5e-324, std::numeric_limits<double>::infinity()}},
        {"dates", Array{dateFromEpoch(0), dateFromEpoch(1769860800), dateFromEpoch(-2e9), dateFromEpoch(2.5e11)}},
        {"data", Array{Data{}, Data{0}, Data{1, 2}, Data{0xFF, 0xFE, 0xFD}, Data(70'000, 0x5A)}},
        {"texts", Array{"", "plain", "<&>\"' ]]>", " kept \t\r\n space ", "Größe", "日本語", "😀\u07FF\uFFFD", "Größe",
                        std::string(300, 'x'), std::string(600, 'y') + "é"}},
        {"ключ & <key>", Dictionary{{"", Array{}}, {"empty", Dictionary{}}}},
        {"many", many},
        {"deep", deep},
    };
}

TEST(PropertyList, ReadsBackWhatItWrites) {
    for (PropertyListFormat form : forms) {
        const auto document = serializePropertyList(everything(), form);
        ASSERT_TRUE(document) << document.error().text;
        const auto value = parsePropertyList(*document);
        ASSERT_TRUE(value) << value.error().text;
        EXPECT_EQ(*value, everything());
        for (const Value& scalar : {Value(true), Value(7), Value(""), Value(Data{})})
            EXPECT_EQ(*parsePropertyList(*serializePropertyList(scalar, form)), scalar);
        const auto nan = parsePropertyList(*serializePropertyList(std::nan(""), form));
        EXPECT_TRUE(std::isnan(nan->asNumber().value_or(0)));
    }
}

TEST(PropertyList, RefusesToWriteWhatItCannotHold) {
    struct {
        Value value;
        bool binaryHolds;
    } const cases[] = {
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
    for (const auto& c : cases) {
        const auto binary = serializePropertyList(c.value, PropertyListFormat::Binary);
        ASSERT_EQ(static_cast<bool>(binary), c.binaryHolds) << c.value.description();
        if (binary) {
            EXPECT_EQ(*parsePropertyList(*binary), c.value) << c.value.description();
        }
        const auto xml = serializePropertyList(c.value, PropertyListFormat::Xml);
        EXPECT_EQ(static_cast<bool>(xml), c.value == Value(dateFromEpoch(1769860800.25))) << c.value.description();
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
        EXPECT_FALSE(parsePropertyList(*serializePropertyList(std::string(documentBytes, 'x'), form)));
    }
    const auto tooDeep = parseXml("<array><array><array><array><array><array><array><array><array><array><array><array>"
                                  "<array><array><array><array><array>");
    EXPECT_NE(tooDeep.error().text.find("nested too deeply"), std::string::npos) << tooDeep.error().text;
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
    for (const auto& [content, expected] : contents) {
        const auto value = parseXml(content);
        ASSERT_TRUE(value) << content << ": " << value.error().text;
        EXPECT_EQ(*value, expected) << content << ": " << value->description();
    }
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
        {"<plist/>", "no value"},
        {"<plist>\n<true/>\n  <false/></plist>", "line 3:3: a second root value"},
        {"<plist><dict><key>a</key></dict></plist>", "a key without a value"},
        {"<plist><dict><true/></dict></plist>", "a value without a key"},
        {"<plist><dict><key>a</key><key>b</key></dict></plist>", "a key out of place"},
        {"<plist><key>a</key></plist>", "a key out of place"},
        {"<plist><array>x</array></plist>", "text outside of a value"},
        {"<plist><string><b/></string></plist>", "an element within <string>"},
        {"<plist><set/></plist>", "an unknown element"},
        {"<plist><plist><true/></plist></plist>", "an unknown element"},
        {"<plist><true>x</true></plist>", "not a valid true"},
        {"<plist><integer/></plist>", "not a valid integer"},
        {"<plist><integer>1.5</integer></plist>", "not a valid integer"},
        {"<plist><integer>--1</integer></plist>", "not a valid integer"},
        {"<plist><integer>18446744073709551616</integer></plist>", "not a valid integer"},
        {"<plist><integer>-9223372036854775809</integer></plist>", "not a valid integer"},
        {"<plist><real>+-1</real></plist>", "not a valid real"},
        {"<plist><real>one</real></plist>", "not a valid real"},
        {"<plist><date>2023-02-29T00:00:00Z</date></plist>", "not a valid date"},
        {"<plist><date>2023-01-01T24:00:00Z</date></plist>", "not a valid date"},
        {"<plist><data>AQ=</data></plist>", "not a valid data"},
        {"<plist><data>A===</data></plist>", "not a valid data"},
        {"<plist><data>AQ==AQ==</data></plist>", "not a valid data"},
        {"<plist><string>\xED\xA0\x80</string></plist>", "line 1:16"},
        {"<plist><string>&#xD800;</string></plist>", "line 1:16"},
        {"<!DOCTYPE p [<!ENTITY a 'x'>]><plist><string>&a;</string></plist>", "entities are not supported"},
        {"<!DOCTYPE p [<!ENTITY % a SYSTEM 'file:///etc/passwd'>%a;]><plist/>", "entities are not supported"},
        {"<!DOCTYPE p SYSTEM 'x.dtd'><plist><string>a&gone;b</string></plist>", "entities are not supported"},
    };
    for (const auto& [document, complaint] : documents) {
        const auto value = parsePropertyList(bytes(document));
        ASSERT_FALSE(value) << document;
        EXPECT_NE(value.error().text.find(complaint), std::string::npos) << document << ": " << value.error().text;
    }
}

// A binary document of objects that are given as their bytes; references and offsets are two bytes wide.
Data binaryOf(const std::vector<std::string>& objects, std::uint8_t root = 0) {
    std::string document = "bplist00", table;
    for (const std::string& object : objects) {
        table += {static_cast<char>(document.size() >> 8), static_cast<char>(document.size())};
        document += object;
    }
    const std::size_t tableAt = document.size();
    document += table + std::string(6, '\0') + "\2\2" + std::string(6, '\0');
    document += {static_cast<char>(objects.size() >> 8), static_cast<char>(objects.size())};
    document += std::string(7, '\0') + static_cast<char>(root) + std::string(6, '\0');
    document += {static_cast<char>(tableAt >> 8), static_cast<char>(tableAt)};
    return bytes(document);
}

std::string raw(std::initializer_list<int> values) {
    return {values.begin(), values.end()};
}

TEST(BinaryPropertyList, ReadsTheObjectsOfOtherTools) {
    const std::pair<std::string, Value> objects[] = {
        {raw({0x08}), false},
        {raw({0x13, -1, -1, -1, -1, -1, -1, -1, -2}), -2},
        {raw({0x12, -1, -1, -1, -1}), 4294967295},
        {raw({0x14, 0, 0, 0, 0, 0, 0, 0, 0, -128, 0, 0, 0, 0, 0, 0, 0}), 9223372036854775808.0},
        {raw({0x22, 0x3F, 0, 0, 0}), 0.5},
        {raw({0x33, 0x3F, -32, 0, 0, 0, 0, 0, 0}), dateFromEpoch(978307200.5)},
        {raw({0x62, 0xD8 - 256, 0x3D, 0xDE - 256, 0x00}), "😀"},
        {raw({0x5F, 0x10, 2, 'a', 'b'}), "ab"},
        {raw({0x4F, 0x13, 0, 0, 0, 0, 0, 0, 0, 1, 9}), Data{9}},
    };
    for (const auto& [object, expected] : objects) {
        const auto value = parsePropertyList(binaryOf({object}));
        ASSERT_TRUE(value) << expected.description() << ": " << value.error().text;
        EXPECT_EQ(*value, expected);
    }
}

TEST(BinaryPropertyList, RefusesHostileObjectsAndSaysWhere) {
    const std::string text = "\x51k", manyKeys = raw({0xD2 - 256, 0, 1, 0, 1, 0, 0, 0, 0}) + text;
    const std::pair<std::vector<std::string>, const char*> documents[] = {
        {{raw({0xA1 - 256, 0, 0})}, "byte 8: nested too deeply"},                               // holds itself
        {{raw({0xA2 - 256, 0, 1, 0, 1}), raw({0xA2 - 256, 0, 0, 0, 0})}, "nested too deeply"},  // each holds the other
        {{raw({0xD1 - 256, 0, 1, 0, 0}), text}, "nested too deeply"},
        {{raw({0xA1 - 256, 0, 1})}, "byte 9: a reference to no object"},
        {{raw({0xD1 - 256, 0, 1, 0, 1}), raw({0x10, 7})}, "byte 9: a key that is no string"},
        {{raw({0xD1 - 256, 0, 0, 0, 0})}, "a key that is no string"},
        {{raw({0xAF - 256, 0x13, 0x7F, -1, -1, -1, -1, -1, -1, -1})}, "a count beyond the document"},
        {{raw({0xDF - 256, 0x13, -128, 0, 0, 0, 0, 0, 0, 1})}, "a count beyond the document"},
        {{raw({0x4F, 0x10, 10})}, "contents that end beyond the objects"},
        {{raw({0x61, 0})}, "contents that end beyond the objects"},
        {{raw({0x5F})}, "a broken count"},
        {{raw({0x5F, 0x14}) + std::string(16, '\0')}, "a broken count"},
        {{raw({0x5F, 0x33, 0, 0, 0, 0, 0, 0, 0, 0})}, "a broken count"},
        {{raw({0x13, 0, 0})}, "contents that end beyond the objects"},
        {{raw({0x15}) + std::string(32, '\0')}, "an integer too wide"},
        {{raw({0x14, 0, 0, 0, 0, 0, 0, 0, 1}) + std::string(8, '\0')}, "an integer out of range"},
        {{raw({0x51, 0xE9 - 256})}, "text that is not valid"},
        {{raw({0x61, 0xD8 - 256, 0})}, "text that is not valid"},
        {{raw({0x33, 0x7F, 0xF0 - 256, 0, 0, 0, 0, 0, 0})}, "a date that is not finite"},
        {{raw({0x00})}, "not supported"},              // a null
        {{raw({0x80 - 256, 1})}, "not supported"},     // a UID
        {{raw({0xC1 - 256, 0, 0})}, "not supported"},  // a set
        {{raw({0x21, 0, 0})}, "not supported"},
    };
    for (const auto& [objects, complaint] : documents) {
        const auto value = parsePropertyList(binaryOf(objects));
        ASSERT_FALSE(value) << complaint;
        EXPECT_NE(value.error().text.find(complaint), std::string::npos) << complaint << ": " << value.error().text;
    }
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
        std::string array = raw({0xAE - 256});
        for (int i = 0; i < 14; ++i) array += raw({0, level});
        tower.push_back(array);
    }
    tower.push_back(raw({0x09}));
    EXPECT_NE(parsePropertyList(binaryOf(tower)).error().text.find("too many values"), std::string::npos);

    auto list = [](std::size_t count, int first, int step) {  // of references
        std::string array = raw({0xAF - 256, 0x11, static_cast<int>(count >> 8), static_cast<int>(count)});
        for (std::size_t i = 0; i < count; ++i) {
            const int ref = first + step * static_cast<int>(i);
            array += raw({ref >> 8, ref});
        }
        return array;
    };
    // The same text ten thousand times is one text; as a key it would be copied each time.
    const std::string text = raw({0x5F, 0x11, 0x40, 0}) + std::string(0x4000, 'x');
    const auto shared = parsePropertyList(binaryOf({list(10'000, 1, 0), text}));
    ASSERT_TRUE(shared) << shared.error().text;
    EXPECT_EQ(shared->asArray()->front().asString(), shared->asArray()->back().asString());
    const std::string keyed = raw({0xD1 - 256, 0, 2, 0, 2});
    EXPECT_NE(parsePropertyList(binaryOf({list(10'000, 1, 0), keyed, text})).error().text.find("contents too large"),
              std::string::npos);

    // Data that overlaps: each object's content holds the next objects.
    std::vector<std::string> overlapping = {list(3000, 1, 1)};
    for (int i = 0; i < 3000; ++i) overlapping.push_back(raw({0x4F, 0x11, 0x20, 0}));
    overlapping.push_back(std::string(0x2000, 'z'));
    EXPECT_NE(parsePropertyList(binaryOf(overlapping)).error().text.find("contents too large"), std::string::npos);
}

// A folder for the documents that are exchanged with Python's plistlib.
class PropertyListExchange : public testing::Test {
protected:
    void SetUp() override {
        std::string name = (std::filesystem::temp_directory_path() / "plist-XXXXXX").string();
        ASSERT_NE(mkdtemp(name.data()), nullptr);
        folder_ = name;
    }
    void TearDown() override { std::filesystem::remove_all(folder_); }

    void runPython(const std::string& script) {
        std::ofstream(folder_ / "script.py") << "import plistlib, sys, datetime, math\n" << script;
        const std::string command = "cd '" + folder_.string() + "' && /usr/bin/python3 script.py";
        ASSERT_EQ(std::system(command.c_str()), 0) << script;
    }
    Data read(const std::string& name) const {
        std::ifstream file(folder_ / name, std::ios::binary);
        return {std::istreambuf_iterator<char>(file), {}};
    }
    void write(const std::string& name, const Data& document) const {
        std::ofstream(folder_ / name, std::ios::binary)
            .write(reinterpret_cast<const char*>(document.data()), static_cast<std::streamsize>(document.size()));
    }

private:
    std::filesystem::path folder_;
};

TEST_F(PropertyListExchange, ReadsWhatPythonWrites) {
    runPython(R"(
value = {'bool': [True, False], 'int': [0, 255, 256, 65536, -1, 2**31, 2**63 - 1, -2**63, 2**63, 2**64 - 1],
         'real': [0.5, -1e300, float('inf')], 'data': bytes(range(256)), 'empty': [{}, [], '', b''],
         'date': datetime.datetime(2026, 1, 31, 12, 0, 0), 'text': ['plain', 'Grüße <&>', '日本語', '😀'],
         'deep': [[[[[[{'k': 'v'}]]]]]], 'many': {'k%d' % i: [i, 'x' * i] for i in range(300)}}
for name, form in ('xml', plistlib.FMT_XML), ('binary', plistlib.FMT_BINARY):
    with open(name, 'wb') as file: plistlib.dump(value, file, fmt=form)
)");
    Data allBytes(256);
    for (std::size_t i = 0; i < 256; ++i) allBytes[i] = static_cast<std::uint8_t>(i);
    Dictionary many;
    for (int i = 0; i < 300; ++i)
        many["k" + std::to_string(i)] = Array{i, std::string(static_cast<std::size_t>(i), 'x')};
    Value deep = Dictionary{{"k", "v"}};
    for (int i = 0; i < 6; ++i) deep = Array{deep};
    const Value expected = Dictionary{
        {"bool", Array{true, false}},
        {"int", Array{0, 255, 256, 65536, -1, std::int64_t{1} << 31, std::numeric_limits<std::int64_t>::max(),
                      std::numeric_limits<std::int64_t>::min(), 9223372036854775808.0, 18446744073709551616.0}},
        {"real", Array{0.5, -1e300, std::numeric_limits<double>::infinity()}},
        {"data", allBytes},
        {"empty", Array{Dictionary{}, Array{}, "", Data{}}},
        {"date", dateFromEpoch(1769860800)},
        {"text", Array{"plain", "Grüße <&>", "日本語", "😀"}},
        {"deep", deep},
        {"many", many},
    };
    for (const char* name : {"xml", "binary"}) {
        const auto value = parsePropertyList(read(name));
        ASSERT_TRUE(value) << name << ": " << value.error().text;
        EXPECT_EQ(*value, expected) << name;
    }
}

// Python compares what it read with what it reads from its own document of the same value.
TEST_F(PropertyListExchange, PythonReadsWhatIsWrittenHere) {
    write("xml", *serializePropertyList(everything(), PropertyListFormat::Xml));
    write("binary", *serializePropertyList(everything(), PropertyListFormat::Binary));
    runPython(R"(
xml, binary = (plistlib.load(open(name, 'rb')) for name in ('xml', 'binary'))
assert xml == binary
epoch = datetime.datetime(1970, 1, 1)
assert xml['booleans'] == [True, False, True]
assert xml['integers'] == [n for b in range(63) for n in (2**b - 1, 2**b, -2**b)] + [2**63 - 1, -2**63]
assert xml['reals'] == [0.0, -0.5, 0.1, 1e300, 5e-324, math.inf]
assert xml['dates'] == [epoch + datetime.timedelta(seconds=s) for s in (0, 1769860800, -2e9, 2.5e11)]
assert xml['data'] == [b'', b'\0', b'\1\2', b'\xff\xfe\xfd', b'\x5a' * 70000]
assert xml['texts'] == ['', 'plain', '<&>"\' ]]>', ' kept \t\r\n space ', 'Größe', '日本語', '😀\u07ff\ufffd', 'Größe',
                        'x' * 300, 'y' * 600 + 'é']
assert xml['ключ & <key>'] == {'': [], 'empty': {}}
assert xml['many'] == {'key %d' % i: [i, 'shared', str(i)] for i in range(400)}
)");
    runPython("value = {'k': [1, 'x']}\nplistlib.dump(value, open('small', 'wb'), fmt=plistlib.FMT_BINARY)\n");
    EXPECT_EQ(read("small").size(),
              serializePropertyList(Dictionary{{"k", Array{1, "x"}}}, PropertyListFormat::Binary)->size());
}

}  // namespace
}  // namespace vrx::codec
