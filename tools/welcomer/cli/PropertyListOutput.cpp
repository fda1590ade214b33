#include "tools/welcomer/cli/PropertyListOutput.h"

#include "propertylist/Base64.h"
#include "text/Describe.h"
#include "tools/welcomer/terminal/Printable.h"

#include <ostream>

namespace welcomer::tool {

namespace {

//  head    the line that the value stands on or below; empty for none
//  indent  of the lines below
void appendOutline(std::vector<std::string>& lines, const std::string& head, const PropertyList& value,
                   const std::string& indent) {
    const auto* const dictionary = value.dictionary();
    const auto* const array = value.array();
    if ((dictionary && !dictionary->empty()) || (array && !array->empty())) {
        if (!head.empty()) {
            lines.push_back(head);
        }
        for (const auto& [key, entry] : dictionary ? *dictionary : PropertyList::Dictionary()) {
            appendOutline(lines, indent + printable(key) + ":", entry, indent + "  ");
        }
        for (const PropertyList& entry : array ? *array : PropertyList::Array()) {
            appendOutline(lines, indent + "-", entry, indent + "  ");
        }
        return;
    }
    const std::string text = dictionary ? "(empty dictionary)"
                             : array    ? "(empty array)"
                                        : printable(text::describe(value));
    lines.push_back((head.empty() ? indent : head + " ") + text);
}

} // namespace

Json toJson(const PropertyList& value) {
    switch (value.type()) {
    case PropertyList::Type::Dictionary: {
        Json object = Json::object();
        for (const auto& [key, entry] : *value.dictionary()) {
            // Not operator[], which looks for the key first: that takes time in proportion to all keys
            // before.
            object.get_ref<Json::object_t&>().emplace_back(key, toJson(entry));
        }
        return object;
    }
    case PropertyList::Type::Array: {
        Json array = Json::array();
        for (const PropertyList& entry : *value.array()) {
            array.push_back(toJson(entry));
        }
        return array;
    }
    case PropertyList::Type::String:
        return *value.string();
    case PropertyList::Type::Integer:
        if (const auto integer = value.integer()) {
            return *integer;
        }
        return *value.unsignedInteger();
    case PropertyList::Type::Real:
        return *value.real();
    case PropertyList::Type::Boolean:
        return *value.boolean();
    case PropertyList::Type::Data: {
        std::string text;
        appendBase64(text, value.data()->bytes);
        return text;
    }
    case PropertyList::Type::Date:
        return text::describe(value);
    }
    return nullptr;
}

void printJson(std::ostream& out, const Json& document) {
    // In ASCII: of what lies beyond, some characters control the terminal.
    out << document.dump(2, ' ', true, Json::error_handler_t::replace) << '\n';
}

std::vector<std::string> outline(const PropertyList& value, const std::string& indent) {
    std::vector<std::string> lines;
    appendOutline(lines, "", value, indent);
    return lines;
}

} // namespace welcomer::tool
