// Texts of the agent's companion UI bundle in the user's language. Any thread may ask.
#pragma once

#include <string>
#include <string_view>

namespace vrx::platform {

class LocalizedStrings {
public:
    virtual ~LocalizedStrings() = default;
    // The text of a key in a table of the bundle; the default where the bundle, the table or the key is missing.
    virtual std::string localizedString(std::string_view key, std::string_view defaultText,
                                        std::string_view table) const = 0;
};

}  // namespace vrx::platform
