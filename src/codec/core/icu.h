// ICU, opened when a number or a time zone is first asked for: with its data it would be most of a small process.
#pragma once

#include <unicode/uvernum.h>

#include "vrx/codec/core/lazy_library.h"

namespace vrx::codec {

// The library of the headers' version, whose functions all carry it at the end of their names.
inline const LazyLibrary& icu() {
    static const LazyLibrary library("libicui18n.so." U_ICU_VERSION_SHORT,
                                     "_" + std::to_string(U_ICU_VERSION_MAJOR_NUM));
    return library;
}

}  // namespace vrx::codec
