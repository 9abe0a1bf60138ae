// ICU, opened when a number or a time zone is first asked for: its data would make up most of a small process.
#pragma once

#include <unicode/uvernum.h>

#include "vrx/codec/core/lazy_library.h"

namespace vrx::codec {

// The library in the version of the headers. All its functions carry that version at the end of their names.
inline const LazyLibrary& icu() {
    static const LazyLibrary library("libicui18n.so." U_ICU_VERSION_SHORT,
                                     "_" + std::to_string(U_ICU_VERSION_MAJOR_NUM));
    return library;
}

}  // namespace vrx::codec
