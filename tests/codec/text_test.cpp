// Numbers as texts.
#include <gtest/gtest.h>

#include <cstdlib>

#include "vrx/codec/core/number_format.h"

namespace vrx::codec {
namespace {

TEST(DecimalText, GroupsAsTheLocaleDoes) {
    const std::tuple<std::uint64_t, const char*, const char*> cases[] = {
        {0, "en_US", "0"},
        {1234, "en_US", "1,234"},
        {1234567, "de_DE", "1.234.567"},
        {1234567, "hi_IN", "12,34,567"},
        {1234567, "fr_FR", "1\u202F234\u202F567"},
        {1234, "ar_EG", "١٬٢٣٤"},
        {1234, "en_QQ", "1,234"},
        {18446744073709551615u, "en_US", "18,446,744,073,709,551,615"},
    };
    for (const auto& [number, locale, text] : cases) EXPECT_EQ(decimalText(number, locale), text) << locale;
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
