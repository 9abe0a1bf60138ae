#include "settings/remembered.h"

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <utility>

namespace vrx::settings {

namespace {

namespace files = std::filesystem;

constexpr std::size_t most = 256;

// FNV-1a: the same in every process and release.
std::uint64_t keyOf(std::string_view identifier, std::string_view title) {
    std::uint64_t key = 0xcbf29ce484222325;
    const auto take = [&key](char c) { key = (key ^ static_cast<unsigned char>(c)) * 0x100000001b3; };
    std::ranges::for_each(identifier, take);
    take('\0');
    std::ranges::for_each(title, take);
    return key;
}

}  // namespace

Remembered::Remembered(std::string file) : file_(std::move(file)) {
    std::ifstream stream(file_);
    std::uint64_t key = 0;
    while (keys_.size() < most && stream >> std::hex >> key) keys_.push_back(key);
}

bool Remembered::contains(std::string_view identifier, std::string_view title) const {
    return std::ranges::find(keys_, keyOf(identifier, title)) != keys_.end();
}

void Remembered::add(std::string_view identifier, std::string_view title) {
    if (contains(identifier, title)) return;
    if (keys_.size() == most) keys_.erase(keys_.begin());
    keys_.push_back(keyOf(identifier, title));
    store();
}

// Whole or not at all.
void Remembered::store() const {
    const files::path file(file_), next(file_ + ".new");
    std::error_code error;
    files::create_directories(file.parent_path(), error);
    std::ofstream stream(next);
    for (const std::uint64_t key : keys_) stream << std::hex << key << '\n';
    stream.close();
    if (stream) files::rename(next, file, error);
}

std::string Remembered::usualFile() {
    const char* state = std::getenv("XDG_STATE_HOME");
    const char* home = std::getenv("HOME");
    const std::string folder = state && *state == '/' ? state : std::string(home ? home : "") + "/.local/state";
    return folder + "/vrx-settings/notified";
}

}  // namespace vrx::settings
