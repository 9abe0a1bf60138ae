#include "vrx/platform/http_request.h"

#include <algorithm>

namespace vrx::platform {

bool HeaderNameOrder::operator()(std::string_view a, std::string_view b) const {
    auto lower = [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; };
    return std::ranges::lexicographical_compare(a, b, {}, lower, lower);
}

}  // namespace vrx::platform
