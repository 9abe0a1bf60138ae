// Random numbers that are the same with every compiler and library: splitmix64. Never draw twice in one expression, as
// the order of the draws would be the compiler's choice.
#pragma once

#include <cstddef>
#include <cstdint>

namespace vrx::simulation {

class Random {
public:
    explicit Random(std::uint64_t seed) : state_(seed) {}

    std::uint64_t next() {
        std::uint64_t mixed = state_ += 0x9e3779b97f4a7c15;
        mixed = (mixed ^ (mixed >> 30)) * 0xbf58476d1ce4e5b9;
        mixed = (mixed ^ (mixed >> 27)) * 0x94d049bb133111eb;
        return mixed ^ (mixed >> 31);
    }
    // From 0 on, less than the bound, which is above 0.
    std::int64_t below(std::int64_t bound) {
        return static_cast<std::int64_t>(next() % static_cast<std::uint64_t>(bound));
    }
    std::int64_t between(std::int64_t least, std::int64_t most) { return least + below(most - least + 1); }
    bool chance(std::int64_t percent) { return below(100) < percent; }
    template <class T, std::size_t size>
    const T& oneOf(const T (&choices)[size]) {
        return choices[below(static_cast<std::int64_t>(size))];
    }

private:
    std::uint64_t state_;
};

}  // namespace vrx::simulation
