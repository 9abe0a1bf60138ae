// The numbers of the binary form of property lists, for its reader and its writer.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace vrx::codec::binary_property_list {

inline constexpr std::string_view family = "bplist";
inline constexpr std::string_view header = "bplist00";

// The trailer ends the document: five unused bytes, the sort version, then these. All numbers are big-endian.
inline constexpr std::size_t trailerBytes = 32;
inline constexpr std::size_t offsetWidthAt = 6;
inline constexpr std::size_t refWidthAt = 7;
inline constexpr std::size_t objectCountAt = 8;
inline constexpr std::size_t rootAt = 16;
inline constexpr std::size_t offsetTableAt = 24;

// An object begins with a byte that holds its kind and its length. The length countFollows means that an integer object
// with the length follows.
inline constexpr std::uint8_t falseObject = 0x08, trueObject = 0x09, dateObject = 0x33;
inline constexpr std::uint8_t countFollows = 0x0F;
enum Kind : std::uint8_t {
    Integer = 0x10,  // the length is the binary logarithm of the number of bytes
    Real = 0x20,
    Data = 0x40,
    AsciiString = 0x50,
    Utf16String = 0x60,
    Array = 0xA0,
    Dictionary = 0xD0  // all key references, then all value references
};

// Dates count from 2001-01-01 00:00:00 UTC.
inline constexpr double epochOfDates = 978307200;

}  // namespace vrx::codec::binary_property_list
