// A failure as a value: the domain that reports it, a code within the domain, and a text for people.
#pragma once

#include <optional>
#include <string>
#include <utility>
#include <variant>

namespace vrx::platform {

// Where an error comes from, and what its code means there.
namespace error_domain {
inline constexpr const char* archive = "archive";             // an errno: EBADMSG for an archive that was rejected
inline constexpr const char* bundle = "bundle";               // an errno: EPERM for a file that others can change
inline constexpr const char* client = "client";               // the errno of the connection to the agent
inline constexpr const char* credential = "credential";       // host::CredentialFailure
inline constexpr const char* database = "database";           // SQLite's result code
inline constexpr const char* followUp = "follow-up";          // an errno of the service; 0 for a document of an item
inline constexpr const char* http = "http";                   // the host's: a CURLcode; the simulated host's: its own
inline constexpr const char* json = "json";                   // EBADMSG when reading, EINVAL when writing
inline constexpr const char* profile = "profile";             // 0; EPERM for one that others could change
inline constexpr const char* propertyList = "property list";  // EBADMSG when reading, EINVAL when writing
inline constexpr const char* store = "store";                 // the HTTP status of the answer; 0 for any other failure
inline constexpr const char* system = "system";               // an errno
inline constexpr const char* wire = "wire";                   // EBADMSG
}  // namespace error_domain

struct Error {
    std::string domain;  // one of error_domain
    int code = 0;
    std::string text;

    bool operator==(const Error&) const = default;
    std::string description() const;  // "text (domain code)"
};

// Either a value or the error that stands in its place. Callers may ask value() and error() only for what is there.
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

// The outcome of an operation that returns no value: no error means success.
using MaybeError = std::optional<Error>;

}  // namespace vrx::platform
