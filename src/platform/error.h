// A failure as a value: the domain that reports it, a code within the domain, and a text for people.
#pragma once

#include <optional>
#include <string>
#include <utility>
#include <variant>

namespace vrx::platform {

struct Error {
    std::string domain;
    int code = 0;
    std::string text;

    bool operator==(const Error&) const = default;
    std::string description() const;  // "text (domain code)"
};

// Either a value or the error that stands in its place. value() and error() may only be asked for what is there.
template <class T>
class Result {
public:
    Result(T value) : content_(std::in_place_index<0>, std::move(value)) {}
    Result(Error error) : content_(std::in_place_index<1>, std::move(error)) {}

    explicit operator bool() const { return content_.index() == 0; }
    const T& value() const& { return std::get<0>(content_); }
    T&& value() && { return std::get<0>(std::move(content_)); }
    const T& operator*() const& { return value(); }
    T&& operator*() && { return std::get<0>(std::move(content_)); }
    const T* operator->() const { return &value(); }
    const Error& error() const { return std::get<1>(content_); }

private:
    std::variant<T, Error> content_;
};

// The outcome of an operation that gives nothing: no error is success.
using MaybeError = std::optional<Error>;

}  // namespace vrx::platform
