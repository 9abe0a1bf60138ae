#include "vrx/codec/core/number_format.h"

#include <unicode/unum.h>

#include <memory>
#include <mutex>
#include <string_view>

#include "vrx/codec/core/icu.h"
#include "vrx/codec/core/unicode.h"

namespace vrx::codec {

namespace {

constexpr const char* commonStyle = "root";

struct Functions {
    decltype(&::uloc_getDefault) getDefault = icu().function("uloc_getDefault");
    decltype(&::uloc_getLanguage) getLanguage = icu().function("uloc_getLanguage");
    decltype(&::unum_open) open = icu().function("unum_open");
    decltype(&::unum_close) close = icu().function("unum_close");
    decltype(&::unum_formatDecimal) format = icu().function("unum_formatDecimal");
    decltype(&::unum_getLocaleByType) getLocale = icu().function("unum_getLocaleByType");

    bool areThere() const { return getDefault && getLanguage && open && close && format && getLocale; }
};

const Functions& functions() {
    static const Functions functions;
    return functions;
}

std::string languageOf(const char* locale) {
    char language[ULOC_LANG_CAPACITY] = "";
    UErrorCode status = U_ZERO_ERROR;
    functions().getLanguage(locale, language, sizeof language, &status);
    return U_SUCCESS(status) ? language : "";
}

struct CloseFormat {
    void operator()(void* format) const { functions().close(static_cast<UNumberFormat*>(format)); }
};
using Format = std::unique_ptr<void, CloseFormat>;

Format openFormat(const char* locale) {
    UErrorCode status = U_ZERO_ERROR;
    Format format(functions().open(UNUM_DECIMAL, nullptr, 0, locale, nullptr, &status));
    return U_SUCCESS(status) ? std::move(format) : nullptr;
}

// For an unknown language, the library silently uses the language of the process's environment. For the old name of a
// language it may answer with the present one.
bool isOfEnvironment(const Format& format, const std::string& locale) {
    UErrorCode status = U_ZERO_ERROR;
    const char* valid = functions().getLocale(static_cast<UNumberFormat*>(format.get()), ULOC_VALID_LOCALE, &status);
    if (U_FAILURE(status) || !valid) return false;
    const std::string language = languageOf(valid);
    return language != languageOf(locale.c_str()) && language == languageOf(functions().getDefault());
}

Format formatFor(const std::string& locale) {
    if (!functions().areThere()) return nullptr;
    Format format = openFormat(locale.empty() ? commonStyle : locale.c_str());
    return format && isOfEnvironment(format, locale) ? openFormat(commonStyle) : std::move(format);
}

std::string text(const Format& format, std::uint64_t number) {
    std::string digits = std::to_string(number);
    if (!format) return digits;
    char16_t units[128];  // 20 digits, in some scripts two units each, and separators
    UErrorCode status = U_ZERO_ERROR;
    const std::int32_t length =
        functions().format(static_cast<UNumberFormat*>(format.get()), digits.data(),
                           static_cast<std::int32_t>(digits.size()), units, 128, nullptr, &status);
    if (U_FAILURE(status)) return digits;
    return utf8FromUtf16({units, static_cast<std::size_t>(length)}).value_or(digits);
}

// The format that was used last: opening one takes ten times as long as using it, and nearly always the same language
// comes again.
struct LastFormat {
    std::mutex mutex;
    std::string locale;
    Format format;
};

}  // namespace

std::string decimalText(std::uint64_t number, const std::string& locale) {
    static LastFormat& last = *new LastFormat;  // never destroyed: threads may use it while the process ends
    std::lock_guard lock(last.mutex);
    if (!last.format || last.locale != locale) {
        last.format = formatFor(locale);
        last.locale = locale;
    }
    return text(last.format, number);
}

}  // namespace vrx::codec
