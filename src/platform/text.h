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
#include <vector>

#include "vrx/platform/date.h"

namespace vrx::platform {

inline std::string describeNothing() {
    return "(null)";
}

inline std::string describe(std::string_view text) {
    return std::string(text);
}
inline std::string describe(const char* text) {
    return text ? std::string(text) : describeNothing();
}
inline std::string describe(const std::string& text) {
    return text;
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

template <class List>
std::string describeList(const List& list, const char* opening, const char* closing) {
    std::string text = opening;
    const char* separator = "";
    for (const auto& element : list) {
        text += separator + describe(element);
        separator = ", ";
    }
    return text + closing;
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
    std::string text = "{";
    const char* separator = "";
    for (const auto& [key, value] : dictionary) {
        text += separator + describe(key) + " = " + describe(value) + ";";
        separator = " ";
    }
    return text + "}";
}

// The format with each "%@" replaced by the next text; a placeholder without a text stays.
std::string filled(std::string_view format, std::initializer_list<std::string_view> texts);

template <class T>
concept Describable = requires(const T& value) {
    { describe(value) } -> std::convertible_to<std::string>;
};

}  // namespace vrx::platform
