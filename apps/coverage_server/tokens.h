// The account tokens that the coverage endpoint accepts, and their renewal. Any thread may use it.
#pragma once

#include <map>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace vrx::coverage_server {

class Tokens {
public:
    explicit Tokens(const std::vector<std::string>& initial) : initial_(initial.begin(), initial.end()) {}

    // Stands for a token where the token itself is not shown: "given", or "renewed-N" after the N-th renewal. Nothing
    // when the token is not valid.
    std::optional<std::string> originOf(const std::string& token) const;
    // Returns a new token for the account and service. Their old token is no longer valid, nor are the tokens that
    // belong to no account: those given at start or added.
    std::string renew(const std::string& account, const std::string& service);
    void add(const std::string& token);
    void clear();
    std::vector<std::string> list() const;

private:
    mutable std::mutex mutex_;
    unsigned renewals_ = 0;
    std::set<std::string> initial_;
    std::map<std::pair<std::string, std::string>, std::string> renewed_;
};

}  // namespace vrx::coverage_server
