#include "propertylist/PropertyListWriter.h"

#include "propertylist/Base64.h"
#include "propertylist/CalendarDate.h"
#include "propertylist/PropertyListReader.h"
#include "propertylist/RealText.h"
#include "propertylist/UTF8.h"
#include "propertylist/UnwritableValue.h"

#include <algorithm>
#include <array>
#include <charconv>

namespace welcomer {

namespace {

// The value cannot be written; thrown within the writer only.
struct Unwritable {};

// The bytes of a text that cannot be copied as they stand. A carriage return is written as a reference
// because a reader takes a bare one for a line feed.
constexpr auto kNeedsEscape = [] {
    std::array<bool, 256> needsEscape{};
    for (const char character : {'&', '<', '>', '\r'}) {
        needsEscape[static_cast<unsigned char>(character)] = true;
    }
    return needsEscape;
}();

class XMLPropertyListWriter {
  public:
    std::string write(const PropertyList& value) {
        _text = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n";
        writeValue(value);
        _text += "</plist>\n";
        return std::move(_text);
    }

  private:
    void writeValue(const PropertyList& value) {
        indent();
        switch (value.type()) {
        case PropertyList::Type::Dictionary:
            writeDictionary(*value.dictionary());
            break;
        case PropertyList::Type::Array:
            writeArray(*value.array());
            break;
        case PropertyList::Type::String:
            writeTextElement("<string>", *value.string(), "</string>\n");
            break;
        case PropertyList::Type::Integer:
            writeInteger(value);
            break;
        case PropertyList::Type::Real:
            writePlainElement("<real>", formatReal(*value.real()), "</real>\n");
            break;
        case PropertyList::Type::Boolean:
            _text += *value.boolean() ? "<true/>\n" : "<false/>\n";
            break;
        case PropertyList::Type::Data:
            writeData(value.data()->bytes);
            break;
        case PropertyList::Type::Date:
            writeDate(*value.date());
            break;
        }
    }

    void writeDictionary(const PropertyList::Dictionary& dictionary) {
        requireRoomBelow();
        if (dictionary.empty()) {
            _text += "<dict/>\n";
            return;
        }
        _text += "<dict>\n";
        ++_depth;
        for (const auto& [key, value] : dictionary) {
            indent();
            writeTextElement("<key>", key, "</key>\n");
            writeValue(value);
        }
        leave();
        _text += "</dict>\n";
    }

    void writeArray(const PropertyList::Array& array) {
        requireRoomBelow();
        if (array.empty()) {
            _text += "<array/>\n";
            return;
        }
        _text += "<array>\n";
        ++_depth;
        for (const PropertyList& value : array) {
            writeValue(value);
        }
        leave();
        _text += "</array>\n";
    }

    void writeTextElement(std::string_view opening, std::string_view text, std::string_view closing) {
        if (findInvalidXMLText(text) != std::string_view::npos) {
            throw Unwritable();
        }
        _text += opening;
        auto written = text.begin();
        for (;;) {
            const auto special = std::find_if(
                written, text.end(), [](char c) { return kNeedsEscape[static_cast<unsigned char>(c)]; });
            _text.append(written, special);
            if (special == text.end()) {
                break;
            }
            writeEscaped(*special);
            written = special + 1;
        }
        _text += closing;
    }

    void writeEscaped(char character) {
        switch (character) {
        case '&':
            _text += "&amp;";
            break;
        case '<':
            _text += "&lt;";
            break;
        case '>':
            _text += "&gt;";
            break;
        default:
            _text += "&#13;";
            break;
        }
    }

    void writePlainElement(std::string_view opening, std::string_view text, std::string_view closing) {
        _text.append(opening).append(text).append(closing);
    }

    void writeInteger(const PropertyList& value) {
        std::array<char, 24> digits{};
        const auto integer = value.integer();
        const auto result = integer ? std::to_chars(digits.begin(), digits.end(), *integer)
                                    : std::to_chars(digits.begin(), digits.end(), *value.unsignedInteger());
        writePlainElement("<integer>", {digits.data(), result.ptr}, "</integer>\n");
    }

    // In lines of 76 characters, which other tools and people can live with.
    void writeData(std::string_view bytes) {
        constexpr std::size_t bytesPerLine = 57;
        if (bytes.empty()) {
            _text += "<data></data>\n";
            return;
        }
        const std::size_t lines = (bytes.size() + bytesPerLine - 1) / bytesPerLine;
        const std::size_t needed = _text.size() + bytes.size() / 3 * 4 + lines * (1 + _depth) + 64;
        if (needed > _text.capacity()) {
            _text.reserve(std::max(needed, _text.capacity() * 2));
        }
        _text += "<data>\n";
        for (; !bytes.empty(); bytes.remove_prefix(std::min(bytesPerLine, bytes.size()))) {
            indent();
            appendBase64(_text, bytes.substr(0, bytesPerLine));
            _text += '\n';
        }
        indent();
        _text += "</data>\n";
    }

    void writeDate(PropertyList::Date date) {
        const std::optional<std::string> text = formatCalendarDate(date);
        if (!text) {
            throw Unwritable();
        }
        writePlainElement("<date>", *text, "</date>\n");
    }

    // Before a dictionary or array.
    void requireRoomBelow() const {
        if (_depth == kPropertyListMaximumDepth) {
            throw Unwritable();
        }
    }

    // Ends the content of a container and stands where its closing tag goes.
    void leave() {
        --_depth;
        indent();
    }

    void indent() { _text.append(_depth, '\t'); }

    std::string _text;
    std::size_t _depth = 0; // of dictionaries and arrays around the current value
};

} // namespace

std::optional<std::string> writeXMLPropertyList(const PropertyList& value, std::string* error) {
    try {
        return XMLPropertyListWriter().write(value);
    } catch (const Unwritable&) {
        if (error) {
            *error = findUnwritableValue(value).value_or(std::string());
        }
        return std::nullopt;
    }
}

} // namespace welcomer
