// How the readers of the single formats report what is wrong, and where.

#pragma once

#include "propertylist/PropertyListReader.h"

#include <cstddef>
#include <stdexcept>
#include <string>
#include <string_view>

namespace welcomer {

// Thrown within a reader and caught at its boundary: a reader of nested values can stop at any depth.
class PropertyListReadError : public std::runtime_error {
  public:
    // What is wrong, in one line, and the offset of the byte at which it is.
    PropertyListReadError(const std::string& what, std::size_t offset)
        : std::runtime_error(what),
          _offset(offset) {}

    std::size_t offset() const { return _offset; }

  private:
    std::size_t _offset;
};

// The failure result for an error in a text format: "line 3, column 14: ...". Lines and columns count from 1,
// a column is a character; a byte order mark is none. `bytes` is the whole document.
PropertyListReadResult failureAtLineAndColumn(std::string_view bytes, const PropertyListReadError& error);

// The failure result for an error in a binary format: "byte 14: ...", counted from 0.
PropertyListReadResult failureAtByteOffset(const PropertyListReadError& error);

// A piece of the input as an error message can show it: printable ASCII on one line, and not long.
std::string excerpt(std::string_view text);

} // namespace welcomer
