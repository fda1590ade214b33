#include "tools/welcomer/cli/PropertyListOutput.h"

#include "propertylist/Base64.h"
#include "text/Describe.h"
#include "tools/welcomer/terminal/Printable.h"

#include <ostream>

namespace welcomer::tool {

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

void printOutline(std::ostream& out, const PropertyList& value, const std::string& indent) {
    const auto print = [&](const std::string& label, const PropertyList& entry) {
        out << indent << label;
        const bool nested = (entry.dictionary() && !entry.dictionary()->empty()) ||
                            (entry.array() && !entry.array()->empty());
        if (nested) {
            out << '\n';
            printOutline(out, entry, indent + "  ");
        } else {
            out << ' ';
            printOutline(out, entry, "");
        }
    };
    if (const auto* dictionary = value.dictionary(); dictionary && !dictionary->empty()) {
        for (const auto& [key, entry] : *dictionary) {
            print(printable(key) + ":", entry);
        }
    } else if (const auto* array = value.array(); array && !array->empty()) {
        for (const PropertyList& entry : *array) {
            print("-", entry);
        }
    } else if (dictionary || array) {
        out << indent << (dictionary ? "(empty dictionary)" : "(empty array)") << '\n';
    } else {
        out << indent << printable(text::describe(value)) << '\n';
    }
}

} // namespace welcomer::tool
