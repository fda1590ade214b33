// Property lists as the tool shows them: for programs and for people.

#pragma once

#include "propertylist/PropertyList.h"

#include <iosfwd>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

namespace welcomer::tool {

// Keeps the order in which keys are added.
using Json = nlohmann::ordered_json;

// The value in JSON: data as base64 text, dates as ISO 8601 text in UTC.
Json toJson(const PropertyList& value);

// Prints a JSON document in ASCII, with a line end: what could control a terminal is escaped, and so is every
// character beyond. Bytes that are no UTF-8 become the replacement character.
void printJson(std::ostream& out, const Json& document);

// The lines of the value as an indented outline, one entry on each.
std::vector<std::string> outline(const PropertyList& value, const std::string& indent);

} // namespace welcomer::tool
