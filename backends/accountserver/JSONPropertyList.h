// Property lists as JSON. An object is a dictionary; a number is an integer where neither a point nor an
// exponent is in it, else a real. JSON has no place for data, for dates and for reals that are no numbers.

#pragma once

#include "propertylist/PropertyList.h"
#include "propertylist/PropertyListReader.h"

#include <optional>
#include <string>
#include <string_view>

namespace welcomer::accountserver {

// Reads one JSON value, UTF-8. A member whose value is null is left out; a null elsewhere, a key that appears
// twice in one object, a number that does not fit, and more nesting or values than Protocol.h allows are
// refused.
//  result  the value, or one line of printable ASCII that says what is wrong and where. Never throws for bad
//          input.
// Any thread.
PropertyListReadResult readJSON(std::string_view bytes);

// Writes a value: on one line, reals with a point or an exponent.
//  error   where to say what JSON cannot hold and where in the value it is, or null
//  result  the text, or none where there is such a thing
// Any thread.
std::optional<std::string> writeJSON(const PropertyList& value, std::string* error = nullptr);

// The text between the quotes of a JSON string, piece by piece.
//  text    UTF-8
//  append  called with each piece in turn
template <class Append>
void escapeJSON(std::string_view text, const Append& append) {
    constexpr std::string_view digits = "0123456789abcdef";
    for (std::size_t i = 0; i < text.size(); ++i) {
        const auto byte = static_cast<unsigned char>(text[i]);
        if (byte < 0x20 || byte == 0x7F) {
            append(std::string_view("\\u00"));
            append(digits.substr(byte >> 4U, 1));
            append(digits.substr(byte & 0xFU, 1));
            continue;
        }
        if (text[i] == '"' || text[i] == '\\') {
            append(std::string_view("\\"));
        }
        append(text.substr(i, 1));
    }
}

} // namespace welcomer::accountserver
