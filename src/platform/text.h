// The text that "%@" prints for a value: null as (null), a date as 2026-01-31 12:00:00 +0000, lists as (a, b),
// dictionaries as {key = value; ...} in the order of their keys.
#pragma once

#include <concepts>
#include <cstdint>
#include <initializer_list>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "vrx/platform/date.h"

namespace vrx::platform {

inline std::string describeNothing() {
    return "(null)";
}

// While one is alive, the descriptions that are made on its thread stop after about so many bytes, and say how much
// they leave out.
class BriefDescriptions {
public:
    explicit BriefDescriptions(std::size_t bytes) : previous_(std::exchange(limit_, bytes)) {}
    ~BriefDescriptions() { limit_ = previous_; }
    BriefDescriptions(const BriefDescriptions&) = delete;
    BriefDescriptions& operator=(const BriefDescriptions&) = delete;

    static std::size_t limit() { return limit_; }

private:
    static inline thread_local std::size_t limit_ = std::string::npos;
    const std::size_t previous_;
};

// The text, or its beginning while descriptions are brief.
std::string describe(std::string_view text);
inline std::string describe(const char* text) {
    return text ? describe(std::string_view(text)) : describeNothing();
}
inline std::string describe(const std::string& text) {
    return describe(std::string_view(text));
}
std::string describe(std::int64_t number);
std::string describe(double number);
std::string describe(Date date);

template <class T>
requires requires(const T& object) {
    { object.description() } -> std::convertible_to<std::string>;
}
std::string describe(const T& object) {
    return object.description();
}

template <class T>
std::string describe(const std::shared_ptr<T>& object);
template <class T>
std::string describe(const std::optional<T>& value);
template <class T>
std::string describe(const std::vector<T>& list);
template <class T, class Compare>
std::string describe(const std::set<T, Compare>& set);
template <class K, class T, class Compare>
std::string describe(const std::map<K, T, Compare>& dictionary);

template <class T>
std::string describe(const std::shared_ptr<T>& object) {
    return object ? describe(*object) : describeNothing();
}

template <class T>
std::string describe(const std::optional<T>& value) {
    return value ? describe(*value) : describeNothing();
}

std::string describeLeftOut(std::size_t count, const char* ofWhat);

template <class List, class Describe>
std::string describeEach(const List& list, const char* separator, Describe describeElement) {
    std::string text;
    std::size_t count = 0;
    for (const auto& element : list) {
        if (text.size() >= BriefDescriptions::limit()) return text + describeLeftOut(list.size() - count, "elements");
        if (count++ > 0) text += separator;
        text += describeElement(element);
    }
    return text;
}

template <class List>
std::string describeList(const List& list, const char* opening, const char* closing) {
    return opening + describeEach(list, ", ", [](const auto& element) { return describe(element); }) + closing;
}

template <class T>
std::string describe(const std::vector<T>& list) {
    return describeList(list, "(", ")");
}

template <class T, class Compare>
std::string describe(const std::set<T, Compare>& set) {
    return describeList(set, "{", "}");
}

template <class K, class T, class Compare>
std::string describe(const std::map<K, T, Compare>& dictionary) {
    const auto describeEntry = [](const auto& entry) {
        return describe(entry.first) + " = " + describe(entry.second) + ";";
    };
    return "{" + describeEach(dictionary, " ", describeEntry) + "}";
}

// The format with each "%@" replaced by the next text; a placeholder without a text stays.
std::string filled(std::string_view format, std::initializer_list<std::string_view> texts);

template <class T>
concept Describable = requires(const T& value) {
    { describe(value) } -> std::convertible_to<std::string>;
};

}  // namespace vrx::platform
