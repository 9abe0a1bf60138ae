// What was found out about a life: its trace, and the first thing that must not have happened.
#pragma once

#include <cstdint>
#include <cstring>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace vrx::simulation {

struct Violation {
    double day = 0;
    std::string rule;    // a word
    std::string detail;  // a sentence
};

class Verdict {
public:
    void report(double day, std::string rule, std::string detail) {
        if (!violation) violation = Violation{day, std::move(rule), std::move(detail)};
    }

    std::optional<Violation> violation;
};

// A hash of texts, in their order. It says whether two plays were the same, and shows them if somebody looks.
class Trace {
public:
    std::function<void(std::string_view line)> show;  // empty: nobody looks

    void add(std::string_view text) {
        std::size_t position = 0;
        for (; position + 8 <= text.size(); position += 8) mix(bytes(text.substr(position, 8)));
        mix(bytes(text.substr(position)) ^ (text.size() << 56));
    }
    std::uint64_t hash() const { return hash_; }

private:
    // The first byte is the lowest, on every machine.
    static std::uint64_t bytes(std::string_view text) {
        std::uint64_t value = 0;
        for (std::size_t i = 0; i < text.size(); ++i)
            value |= std::uint64_t{static_cast<unsigned char>(text[i])} << (8 * i);
        return value;
    }
    void mix(std::uint64_t value) {
        hash_ = (hash_ ^ value) * 0x9fb21c651e98df25;
        hash_ ^= hash_ >> 32;
    }

    std::uint64_t hash_ = 0xcbf29ce484222325;
};

}  // namespace vrx::simulation
