// Digests and numbers as texts.
#include <gtest/gtest.h>

#include <cstdlib>
#include <thread>

#include "vrx/codec/core/number_format.h"
#include "vrx/codec/digest.h"

namespace vrx::codec {
namespace {

std::string hexadecimal(const std::array<std::uint8_t, 32>& digest) {
    std::string text;
    for (std::uint8_t byte : digest) {
        char digits[3];
        std::snprintf(digits, sizeof digits, "%02x", byte);
        text += digits;
    }
    return text;
}

TEST(Digest, GivesThePublishedDigestsOnAnyThread) {
    const std::pair<std::string, const char*> messages[] = {
        {"", "e3b0c44298fc1c149afbf4c8996fb92427ae41e4649b934ca495991b7852b855"},
        {"abc", "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad"},
        {std::string(1'000'000, 'a'), "cdc76e5c9914fb9281a1c7e284d73e67f1809a48a497200e046d39ccc7112cd0"},
    };
    std::vector<std::thread> threads;
    for (const auto& message : messages)
        threads.emplace_back([&message] { EXPECT_EQ(hexadecimal(sha256(message.first)), message.second); });
    for (std::thread& thread : threads) thread.join();
}

TEST(DecimalText, GroupsAsTheLocaleDoes) {
    struct {
        std::uint64_t number;
        const char* locale;
        const char* text;
    } const cases[] = {
        {0, "en_US", "0"},
        {1234, "en_US", "1,234"},
        {1234567, "de_DE", "1.234.567"},
        {1234567, "hi_IN", "12,34,567"},
        {1234567, "fr_FR", "1\u202F234\u202F567"},
        {1234, "ar_EG", "١٬٢٣٤"},
        {1234, "en_QQ", "1,234"},
        {18446744073709551615u, "en_US", "18,446,744,073,709,551,615"},
    };
    for (const auto& c : cases) EXPECT_EQ(decimalText(c.number, c.locale), c.text) << c.locale;
}

TEST(DecimalText, GivesAnUnknownLocaleTheCommonStyleWhateverTheEnvironment) {
    const char* before = std::getenv("LC_ALL");
    const std::string saved = before ? before : "";
    setenv("LC_ALL", "de_DE.UTF-8", 1);  // read when the library first looks; a test runs in a process of its own
    for (const char* locale : {"xx_YY", "", "no locale at all, and longer than any that there is", "\xFF"})
        EXPECT_EQ(decimalText(1234, locale), "1,234") << locale;
    EXPECT_EQ(decimalText(1234, "de_AT"), "1\u00A0234");
    before ? setenv("LC_ALL", saved.c_str(), 1) : unsetenv("LC_ALL");
}

}  // namespace
}  // namespace vrx::codec
