#include "coverage_server/tokens.h"

#include <algorithm>
#include <random>

namespace vrx::coverage_server {

std::optional<std::string> Tokens::originOf(const std::string& token) const {
    std::lock_guard lock(mutex_);
    if (initial_.contains(token)) return "given";
    // Such a token begins with its origin.
    if (std::ranges::none_of(renewed_, [&](const auto& entry) { return entry.second == token; })) return std::nullopt;
    return token.substr(0, token.rfind('-'));
}

std::string Tokens::renew(const std::string& account, const std::string& service) {
    std::lock_guard lock(mutex_);
    std::random_device random;
    std::string token =
        "renewed-" + std::to_string(++renewals_) + "-" + std::to_string(random()) + std::to_string(random());
    constexpr std::size_t accountsAtMost = 1000;
    if (renewed_.size() >= accountsAtMost) renewed_.clear();
    initial_.clear();
    return renewed_[{account, service}] = token;
}

void Tokens::add(const std::string& token) {
    std::lock_guard lock(mutex_);
    initial_.insert(token);
}

void Tokens::clear() {
    std::lock_guard lock(mutex_);
    initial_.clear();
    renewed_.clear();
}

std::vector<std::string> Tokens::list() const {
    std::lock_guard lock(mutex_);
    std::vector<std::string> tokens(initial_.begin(), initial_.end());
    for (const auto& [owner, token] : renewed_) tokens.push_back(token);
    return tokens;
}

}  // namespace vrx::coverage_server
