// The account tokens that the coverage endpoint takes, and their renewal. Any thread may use it.
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

    // Where a valid token is from, for people and tests, who are not shown the token itself: "given", or "renewed-N" of
    // the N-th renewal. Nothing for one that is not valid.
    std::optional<std::string> originOf(const std::string& token) const;
    // A new token for the account and service. The one that they had before is no longer valid, nor are those that
    // belong to no account: the ones given at start or added.
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
