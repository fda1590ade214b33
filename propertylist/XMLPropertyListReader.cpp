#include "propertylist/XMLPropertyListReader.h"

#include "propertylist/Base64.h"
#include "propertylist/CalendarDate.h"
#include "propertylist/PropertyListReadError.h"
#include "propertylist/RealText.h"
#include "propertylist/XMLScanner.h"

#include <charconv>
#include <cstdint>

namespace welcomer {

namespace {

class XMLPropertyListReader {
  public:
    enum class RepeatedKeys { LastCounts, Refused };

    XMLPropertyListReader(std::string_view bytes, RepeatedKeys repeatedKeys)
        : _scanner(bytes),
          _repeatedKeys(repeatedKeys) {}

    PropertyList readDocument() {
        _scanner.skipProlog();
        const XMLTag plist = _scanner.readTag();
        if (plist.kind == XMLTag::Kind::Closing || plist.element != XMLElement::PList) {
            _scanner.fail(plist.start, "expected <plist>, found " + describe(plist));
        }
        if (plist.kind == XMLTag::Kind::Empty) {
            _scanner.fail(plist.start, "<plist/> holds no value");
        }
        _scanner.skipToTag(XMLElement::PList);
        const XMLTag first = _scanner.readTag();
        if (first.isClosing(XMLElement::PList)) {
            _scanner.fail(first.start, "<plist> holds no value");
        }
        PropertyList value = _readValue(first);
        _scanner.skipToTag(XMLElement::PList);
        const XMLTag closing = _scanner.readTag();
        if (!closing.isClosing(XMLElement::PList)) {
            _scanner.fail(closing.start,
                          "expected </plist> after the top-level value, found " + describe(closing));
        }
        _scanner.skipIgnorable();
        if (!_scanner.isAtEnd()) {
            _scanner.fail(_scanner.place(), "unexpected content after </plist>");
        }
        return value;
    }

  private:
    PropertyList _readValue(const XMLTag& tag) {
        if (tag.kind == XMLTag::Kind::Closing) {
            _scanner.fail(tag.start, "unexpected " + describe(tag));
        }
        switch (tag.element) {
        case XMLElement::Dictionary:
            return _readDictionary(tag);
        case XMLElement::Array:
            return _readArray(tag);
        case XMLElement::String:
            return _scanner.readText(tag);
        case XMLElement::Integer:
            return _readInteger(tag);
        case XMLElement::Real:
            return _readReal(tag);
        case XMLElement::True:
            return _readBoolean(tag, true);
        case XMLElement::False:
            return _readBoolean(tag, false);
        case XMLElement::Data:
            return _readData(tag);
        case XMLElement::Date:
            return _readDate(tag);
        case XMLElement::PList:
        case XMLElement::Key:
            break;
        }
        _scanner.fail(tag.start, "expected a value, found " + describe(tag));
    }

    void _enter(const XMLTag& tag) {
        if (++_depth > kPropertyListMaximumDepth) {
            _scanner.fail(tag.start,
                          "nested more than " + std::to_string(kPropertyListMaximumDepth) + " deep");
        }
    }

    PropertyList _readDictionary(const XMLTag& tag) {
        PropertyList::Dictionary dictionary;
        _enter(tag);
        if (tag.kind == XMLTag::Kind::Empty) {
            --_depth;
            return PropertyList(std::move(dictionary));
        }
        for (;;) {
            _scanner.skipToTag(XMLElement::Dictionary);
            const XMLTag keyTag = _scanner.readTag();
            if (keyTag.isClosing(XMLElement::Dictionary)) {
                --_depth;
                return PropertyList(std::move(dictionary));
            }
            if (keyTag.kind == XMLTag::Kind::Closing || keyTag.element != XMLElement::Key) {
                _scanner.fail(keyTag.start, "expected <key> or </dict>, found " + describe(keyTag));
            }
            std::string key(_scanner.readText(keyTag));
            _scanner.skipToTag(XMLElement::Dictionary);
            const XMLTag valueTag = _scanner.readTag();
            if (valueTag.isClosing(XMLElement::Dictionary)) {
                _scanner.fail(keyTag.start, "a key without a value");
            }
            if (_repeatedKeys == RepeatedKeys::Refused && dictionary.contains(key)) {
                _scanner.fail(keyTag.start, "the key \"" + excerpt(key) + "\" appears twice");
            }
            // Keys mostly come in order, then the place is known.
            dictionary.insert_or_assign(dictionary.end(), std::move(key), _readValue(valueTag));
        }
    }

    PropertyList _readArray(const XMLTag& tag) {
        PropertyList::Array array;
        _enter(tag);
        if (tag.kind == XMLTag::Kind::Empty) {
            --_depth;
            return PropertyList(std::move(array));
        }
        for (;;) {
            _scanner.skipToTag(XMLElement::Array);
            const XMLTag valueTag = _scanner.readTag();
            if (valueTag.isClosing(XMLElement::Array)) {
                --_depth;
                return PropertyList(std::move(array));
            }
            array.push_back(_readValue(valueTag));
        }
    }

    PropertyList _readInteger(const XMLTag& tag) {
        std::string_view digits = trimmedXMLText(_scanner.readText(tag));
        const bool isNegative = digits.starts_with('-');
        if (isNegative || digits.starts_with('+')) {
            digits.remove_prefix(1);
        }
        int base = 10;
        if (digits.starts_with("0x") || digits.starts_with("0X")) {
            base = 16;
            digits.remove_prefix(2);
        }
        std::uint64_t magnitude = 0;
        const char* const digitsEnd = digits.data() + digits.size();
        const auto [parsed, error] = std::from_chars(digits.data(), digitsEnd, magnitude, base);
        if (digits.empty() || parsed != digitsEnd || error == std::errc::invalid_argument) {
            _scanner.fail(tag.start, "malformed integer");
        }
        constexpr std::uint64_t limit = std::uint64_t{1} << 63;
        if (error != std::errc() || (isNegative && magnitude > limit)) {
            _scanner.fail(tag.start, "the integer does not fit 64 bits");
        }
        return isNegative ? PropertyList(static_cast<std::int64_t>(0 - magnitude)) : PropertyList(magnitude);
    }

    PropertyList _readReal(const XMLTag& tag) {
        const std::optional<double> real = parseReal(trimmedXMLText(_scanner.readText(tag)));
        if (!real) {
            _scanner.fail(tag.start, "malformed real, or one out of range");
        }
        return *real;
    }

    PropertyList _readBoolean(const XMLTag& tag, bool value) {
        if (!trimmedXMLText(_scanner.readText(tag)).empty()) {
            _scanner.fail(tag.start, "unexpected text in " + describe(tag));
        }
        return value;
    }

    PropertyList _readDate(const XMLTag& tag) {
        const std::optional<PropertyList::Date> date =
            parseCalendarDate(trimmedXMLText(_scanner.readText(tag)));
        if (!date) {
            _scanner.fail(tag.start, "malformed date, or one that does not exist");
        }
        return *date;
    }

    PropertyList _readData(const XMLTag& tag) {
        // Data may be very large: it is decoded straight from the document, unless there is markup in it.
        PropertyList::Data data;
        if (tag.kind == XMLTag::Kind::Empty) {
            return PropertyList(std::move(data));
        }
        if (const std::optional<std::string_view> raw = _scanner.peekRawText()) {
            const std::size_t offset = decodeBase64(*raw, data.bytes);
            const bool isWhole = offset == std::string_view::npos;
            if (isWhole || offset == raw->size() || (*raw)[offset] != '&') {
                if (!isWhole) {
                    _scanner.fail(raw->data() + offset, "malformed base64");
                }
                _scanner.skipRawText(*raw);
                _scanner.readClosingTag(tag);
                return PropertyList(std::move(data));
            }
        }
        if (decodeBase64(_scanner.readText(tag), data.bytes) != std::string_view::npos) {
            _scanner.fail(tag.start, "malformed base64");
        }
        return PropertyList(std::move(data));
    }

    XMLScanner _scanner;
    const RepeatedKeys _repeatedKeys;
    int _depth = 0; // of dictionaries and arrays around the current place
};

PropertyListReadResult read(std::string_view bytes, XMLPropertyListReader::RepeatedKeys repeatedKeys) {
    try {
        return {XMLPropertyListReader(bytes, repeatedKeys).readDocument(), {}};
    } catch (const PropertyListReadError& error) {
        return failureAtLineAndColumn(bytes, error);
    }
}

} // namespace

PropertyListReadResult readXMLPropertyList(std::string_view bytes) {
    return read(bytes, XMLPropertyListReader::RepeatedKeys::LastCounts);
}

PropertyListReadResult readXMLPropertyListWithUniqueKeys(std::string_view bytes) {
    return read(bytes, XMLPropertyListReader::RepeatedKeys::Refused);
}

} // namespace welcomer
