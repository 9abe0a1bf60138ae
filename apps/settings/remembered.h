// Which notifications the user has closed, for good: those are not shown again after the next login. A file of lines,
// the newest last, each a number made of what a notification is about; the oldest go beyond a few hundred. One thread.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace vrx::settings {

class Remembered final {
public:
    // A file that cannot be read reads as empty.
    explicit Remembered(std::string file);

    bool contains(std::string_view identifier, std::string_view title) const;
    // Where the file cannot be written, it is remembered as long as this object lives.
    void add(std::string_view identifier, std::string_view title);

    // In $XDG_STATE_HOME, else in ~/.local/state.
    static std::string usualFile();

private:
    void store() const;

    const std::string file_;
    std::vector<std::uint64_t> keys_;
};

}  // namespace vrx::settings
