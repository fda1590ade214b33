// What a fuzz target insists on, whatever the input.

#pragma once

#include "propertylist/PropertyListReader.h"

#include <cstdio>
#include <cstdlib>

namespace welcomer {

// Ends the program, so that the fuzzer keeps the input.
inline void require(bool condition, const char* what) {
    if (!condition) {
        std::fprintf(stderr, "violated: %s\n", what);
        std::abort();
    }
}

// A result has either a value or an error, which is one line of printable text.
inline void requireWellFormed(const PropertyListReadResult& result) {
    require(result.value.has_value() == result.error.empty(), "either a value or an error");
    for (const char character : result.error) {
        require(character >= 0x20 && character <= 0x7E, "an error is one printable line");
    }
}

} // namespace welcomer
