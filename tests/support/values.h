// The names of property values, durations and matchers that tests speak, whatever layer they test.
#pragma once

#include <gmock/gmock.h>

#include "vrx/platform/date.h"
#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx {

using platform::Array;
using platform::Data;
using platform::Date;
using platform::dateFromEpoch;
using platform::Dictionary;
using platform::Duration;
using platform::MaybeError;
using platform::Value;
using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using namespace std::chrono_literals;

// Why there is no result; nothing when there is one.
template <class T>
std::string errorOf(const platform::Result<T>& result) {
    return result ? "" : result.error().text;
}

// The result that there has to be.
template <class T>
T valueOf(const platform::Result<T>& result) {
    EXPECT_TRUE(result) << errorOf(result);
    return result ? *result : T();
}

}  // namespace vrx

namespace vrx::platform {

// In the messages of tests that fail.
inline void PrintTo(const Value& value, std::ostream* out) {
    *out << value.description();
}

}  // namespace vrx::platform
