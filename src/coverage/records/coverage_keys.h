// The keys of a coverage dictionary from which records take their fields, for programs that judge a server's answers.
// Any thread may ask.
#pragma once

#include <string_view>
#include <vector>

namespace vrx {

struct CoverageKey {
    // How the value is read: AsSent is handed on whatever its type, each other one by the rule of its field.
    enum class Kind { Flag, Date, Days, AsSent };

    std::string_view object;  // where the key is: empty for the dictionary itself, else such as "coverage.benefitsCard"
    std::string_view key;
    Kind kind;
};

// In the order of the fields. A key that fills two fields is there twice, with different kinds.
std::vector<CoverageKey> coverageKeys();

}  // namespace vrx
