#pragma once

#if __cplusplus < 202002L
#error "ironmoat needs C++20: compile with -std=c++20 or later"
#include "ironmoat/needs_cxx20.h"  // is not there: the compiler stops at the sentence above
#endif

#include <cstddef>

/// What the shared client library shows. All else in it is hidden, so that it cannot meet a symbol
/// of the daemon's; so is a daemon's use of it when the daemon hides its own.
#define IRONMOAT_API [[gnu::visibility("default")]]

/// The part of the soname behind "libironmoat.so.", with _ for each dot. Raised with every change
/// after which a daemon that was built before would misread or overwrite memory.
#define IRONMOAT_ABI 0_1

// How the standard library was chosen, as far as it changes the size of a list or of a text.
#if defined(_LIBCPP_VERSION)
#define IRONMOAT_DETAIL_LIBRARY libcxx
#elif defined(_GLIBCXX_DEBUG)
#define IRONMOAT_DETAIL_LIBRARY glibcxxDebug
#elif !_GLIBCXX_USE_CXX11_ABI
#define IRONMOAT_DETAIL_LIBRARY glibcxxOldStrings
#else
#define IRONMOAT_DETAIL_LIBRARY glibcxx
#endif

#define IRONMOAT_DETAIL_NAME(prefix, abi, library) IRONMOAT_DETAIL_JOIN(prefix, abi, library)
#define IRONMOAT_DETAIL_JOIN(prefix, abi, library) prefix##Abi_##abi##_##library
/// Named by everything that includes a header, defined by the library. Where the two lay out
/// records differently it is undefined: the daemon does not link, or does not start.
#define IRONMOAT_DETAIL_BUILT_FOR \
  IRONMOAT_DETAIL_NAME(builtFor, IRONMOAT_ABI, IRONMOAT_DETAIL_LIBRARY)

#if __has_cpp_attribute(gnu::retain)
#define IRONMOAT_DETAIL_KEPT [[gnu::used, gnu::retain]]  // from --gc-sections, too
#else
#define IRONMOAT_DETAIL_KEPT [[gnu::used]]
#endif

namespace ironmoat::detail {

IRONMOAT_API extern const char IRONMOAT_DETAIL_BUILT_FOR;
IRONMOAT_DETAIL_KEPT inline const char* const IRONMOAT_DETAIL_NAME(
    needs, IRONMOAT_ABI, IRONMOAT_DETAIL_LIBRARY) = &IRONMOAT_DETAIL_BUILT_FOR;

}  // namespace ironmoat::detail
