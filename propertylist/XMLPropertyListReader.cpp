#include "propertylist/XMLPropertyListReader.h"

#include "propertylist/Base64.h"
#include "propertylist/CalendarDate.h"
#include "propertylist/PropertyListReadError.h"
#include "propertylist/RealText.h"
#include "propertylist/UTF8.h"

#include <algorithm>
#include <bit>
#include <charconv>
#include <cstdint>
#include <cstring>

namespace welcomer {

namespace {

enum class Element { PList, Dictionary, Key, Array, String, Integer, Real, True, False, Data, Date };

constexpr std::string_view kElementNames[] = {"plist", "dict", "key",   "array", "string", "integer",
                                              "real",  "true", "false", "data",  "date"};

constexpr std::string_view nameOf(Element element) {
    return kElementNames[static_cast<std::size_t>(element)];
}

struct Tag {
    enum class Kind { Opening, Closing, Empty };
    Kind kind;
    Element element;
    const char* start; // its '<'
};

constexpr bool isWhiteSpace(char character) {
    return character == ' ' || character == '\t' || character == '\n' || character == '\r';
}

constexpr bool isNameCharacter(char character) {
    return (character >= 'a' && character <= 'z') || (character >= 'A' && character <= 'Z') ||
           (character >= '0' && character <= '9') || character == '_' || character == ':' ||
           character == '-' || character == '.' || static_cast<unsigned char>(character) >= 0x80;
}

// The first character that ends a run of plain text: markup, a reference, or a carriage return, which may
// have to become a line feed.
constexpr bool endsPlainText(char character) {
    return character == '<' || character == '&' || character == '\r';
}

const char* findPlainTextEnd(const char* text, const char* end) {
    // Eight bytes at a time. In `matches` the lowest bit set is that of the first byte that matches; bits
    // above it may be wrong.
    if constexpr (std::endian::native == std::endian::little) {
        constexpr std::uint64_t ones = 0x0101010101010101;
        const auto matches = [](std::uint64_t word, char character) {
            const std::uint64_t difference = word ^ (ones * static_cast<unsigned char>(character));
            return (difference - ones) & ~difference & (ones << 7);
        };
        while (end - text >= 8) {
            std::uint64_t word = 0;
            std::memcpy(&word, text, sizeof word);
            const std::uint64_t found = matches(word, '<') | matches(word, '&') | matches(word, '\r');
            if (found != 0) {
                return text + std::countr_zero(found) / 8;
            }
            text += 8;
        }
    }
    return std::find_if(text, end, endsPlainText);
}

class XMLPropertyListReader {
  public:
    explicit XMLPropertyListReader(std::string_view bytes)
        : _begin(bytes.data()),
          _end(bytes.data() + bytes.size()),
          _cursor(_begin) {}

    PropertyList readDocument() {
        checkText();
        readProlog();
        const Tag plist = readTag();
        if (plist.kind == Tag::Kind::Closing || plist.element != Element::PList) {
            fail(plist.start, "expected <plist>, found " + describe(plist));
        }
        if (plist.kind == Tag::Kind::Empty) {
            fail(plist.start, "<plist/> holds no value");
        }
        skipToTag(Element::PList);
        const Tag first = readTag();
        if (first.kind == Tag::Kind::Closing && first.element == Element::PList) {
            fail(first.start, "<plist> holds no value");
        }
        PropertyList value = readValue(first);
        skipToTag(Element::PList);
        const Tag closing = readTag();
        if (closing.kind != Tag::Kind::Closing || closing.element != Element::PList) {
            fail(closing.start, "expected </plist> after the top-level value, found " + describe(closing));
        }
        skipIgnorable();
        if (_cursor != _end) {
            fail(_cursor, "unexpected content after </plist>");
        }
        return value;
    }

  private:
    [[noreturn]] void fail(const char* where, const std::string& what) const {
        throw PropertyListReadError(what, static_cast<std::size_t>(where - _begin));
    }

    static std::string describe(const Tag& tag) {
        std::string text = tag.kind == Tag::Kind::Closing ? "</" : "<";
        return text.append(nameOf(tag.element)).append(tag.kind == Tag::Kind::Empty ? "/>" : ">");
    }

    std::size_t left() const { return static_cast<std::size_t>(_end - _cursor); }

    bool isNext(std::string_view text) const {
        return left() >= text.size() && std::memcmp(_cursor, text.data(), text.size()) == 0;
    }

    bool skip(std::string_view text) {
        const bool found = isNext(text);
        if (found) {
            _cursor += text.size();
        }
        return found;
    }

    bool skipWhiteSpace() {
        const char* const start = _cursor;
        while (_cursor != _end && isWhiteSpace(*_cursor)) {
            ++_cursor;
        }
        return _cursor != start;
    }

    // Moves behind the next `terminator`; `what` began at `start`.
    void skipThrough(std::string_view terminator, const char* start, const char* what) {
        const std::size_t offset = std::string_view(_cursor, left()).find(terminator);
        if (offset == std::string_view::npos) {
            fail(start, std::string("unterminated ") + what);
        }
        _cursor += offset + terminator.size();
    }

    // ---- Prolog

    void checkText() const {
        const std::string_view text(_begin, left());
        const std::size_t offset = findInvalidXMLText(text);
        if (offset == std::string_view::npos) {
            return;
        }
        const std::string what = describeInvalidXMLText(text, offset);
        fail(_begin + offset, what.starts_with("U+") ? "XML has no place for the character " + what : what);
    }

    void readProlog() {
        skip("\xEF\xBB\xBF");
        skipWhiteSpace();
        if (isNext("<?xml") && left() > 5 && isWhiteSpace(_cursor[5])) {
            readDeclaration();
        }
        skipIgnorable();
        if (isNext("<!DOCTYPE")) {
            skipDocumentType();
            skipIgnorable();
        }
        if (_cursor == _end) {
            fail(_cursor, "no <plist> element");
        }
        if (*_cursor != '<') {
            fail(_cursor, "unexpected text before <plist>");
        }
    }

    void readDeclaration() {
        const char* const start = _cursor;
        _cursor += 5;
        for (;;) {
            const bool isSeparated = skipWhiteSpace();
            if (skip("?>")) {
                return;
            }
            const char* const attribute = _cursor;
            if (!isSeparated || _cursor == _end) {
                fail(start, "malformed XML declaration");
            }
            const auto [name, value] = readAttribute();
            if (name == "encoding" && !isUTF8Name(value)) {
                fail(attribute, "the encoding " + excerpt(value) + " is not supported, only UTF-8 is");
            }
        }
    }

    static bool isUTF8Name(std::string_view encoding) {
        constexpr std::string_view utf8 = "utf-8";
        return std::equal(encoding.begin(), encoding.end(), utf8.begin(), utf8.end(), [](char c, char lower) {
            return (c >= 'A' && c <= 'Z' ? c - 'A' + 'a' : c) == lower;
        });
    }

    // The declaration names a grammar that nobody reads; nothing that it refers to is ever opened.
    void skipDocumentType() {
        const char* const start = _cursor;
        _cursor += std::string_view("<!DOCTYPE").size();
        while (_cursor != _end) {
            const char character = *_cursor++;
            if (character == '>') {
                return;
            }
            if (character == '[') {
                fail(_cursor - 1, "a document type with an internal subset is not allowed");
            }
            if (character == '<') {
                break;
            }
            if (character == '"' || character == '\'') {
                skipThrough({&character, 1}, start, "document type declaration");
            }
        }
        fail(start, "unterminated document type declaration");
    }

    // ---- Markup

    // Passes over white space, comments and processing instructions.
    void skipIgnorable() {
        for (;;) {
            skipWhiteSpace();
            if (left() < 2 || *_cursor != '<') {
                return;
            }
            if (_cursor[1] == '?') {
                skipProcessingInstruction();
            } else if (_cursor[1] != '!' || !skipComment()) {
                return;
            }
        }
    }

    void skipProcessingInstruction() {
        const char* const start = _cursor;
        _cursor += 2;
        const std::string_view target = readName();
        if (target.empty()) {
            fail(start, "a processing instruction without a name");
        }
        if (target.size() == 3 && (target[0] | 0x20) == 'x' && (target[1] | 0x20) == 'm' &&
            (target[2] | 0x20) == 'l') {
            fail(start, "an XML declaration may stand at the beginning only");
        }
        skipThrough("?>", start, "processing instruction");
    }

    bool skipComment() {
        const char* const start = _cursor;
        if (!skip("<!--")) {
            return false;
        }
        skipThrough("--", start, "comment");
        if (!skip(">")) {
            fail(_cursor - 2, "\"--\" within a comment");
        }
        return true;
    }

    // Passes over what may stand between the tags in the content of `parent`.
    void skipToTag(Element parent) {
        skipIgnorable();
        if (_cursor == _end) {
            fail(_cursor, "the document ends within " + describe({Tag::Kind::Opening, parent, nullptr}));
        }
        if (*_cursor != '<') {
            fail(_cursor, "unexpected text in " + describe({Tag::Kind::Opening, parent, nullptr}));
        }
    }

    std::string_view readName() {
        const char* const start = _cursor;
        while (_cursor != _end && isNameCharacter(*_cursor)) {
            ++_cursor;
        }
        return {start, static_cast<std::size_t>(_cursor - start)};
    }

    struct Attribute {
        std::string_view name;
        std::string_view value; // as it stands, references not resolved
    };

    Attribute readAttribute() {
        const char* const start = _cursor;
        const std::string_view name = readName();
        skipWhiteSpace();
        if (name.empty() || !skip("=")) {
            fail(start, "malformed attribute");
        }
        skipWhiteSpace();
        if (_cursor == _end || (*_cursor != '"' && *_cursor != '\'')) {
            fail(start, "the value of an attribute must be quoted");
        }
        const char quote = *_cursor++;
        const char* const value = _cursor;
        skipThrough({&quote, 1}, start, "attribute");
        const std::string_view text(value, static_cast<std::size_t>(_cursor - 1 - value));
        if (text.find('<') != std::string_view::npos) {
            fail(value + text.find('<'), "\"<\" within an attribute");
        }
        return {name, text};
    }

    // Reads the tag that begins here, at a '<'.
    Tag readTag() {
        const char* const start = _cursor++;
        Tag tag{Tag::Kind::Opening, Element::PList, start};
        if (skip("/")) {
            tag.kind = Tag::Kind::Closing;
        }
        const std::string_view name = readName();
        if (!findElement(name, tag.element)) {
            failAtUnknownTag(start, name);
        }
        if (skip(">")) {
            return tag;
        }
        readRestOfTag(tag);
        return tag;
    }

    [[noreturn]] void failAtUnknownTag(const char* start, std::string_view name) const {
        if (!name.empty()) {
            fail(start, "unknown element <" + excerpt(name) + ">");
        }
        const std::string_view text(start, static_cast<std::size_t>(_end - start));
        if (text.starts_with("<![CDATA[")) {
            fail(start, "unexpected CDATA section");
        }
        if (text.starts_with("<!DOCTYPE")) {
            fail(start, "a document type declaration may stand before <plist> only");
        }
        fail(start, "malformed tag");
    }

    void readRestOfTag(Tag& tag) {
        for (;;) {
            const bool isSeparated = skipWhiteSpace();
            if (skip(">")) {
                return;
            }
            if (tag.kind == Tag::Kind::Opening && skip("/>")) {
                tag.kind = Tag::Kind::Empty;
                return;
            }
            if (tag.kind == Tag::Kind::Closing || !isSeparated || _cursor == _end) {
                fail(tag.start, "malformed tag " + describe(tag));
            }
            readAttribute();
        }
    }

    static bool findElement(std::string_view name, Element& element) {
        const auto is = [&](Element candidate) {
            element = candidate;
            return name == nameOf(candidate);
        };
        switch (name.empty() ? 0 : name[0]) {
        case 'k':
            return is(Element::Key);
        case 's':
            return is(Element::String);
        case 'i':
            return is(Element::Integer);
        case 'd':
            return is(Element::Dictionary) || is(Element::Data) || is(Element::Date);
        case 'a':
            return is(Element::Array);
        case 't':
            return is(Element::True);
        case 'f':
            return is(Element::False);
        case 'r':
            return is(Element::Real);
        case 'p':
            return is(Element::PList);
        default:
            return false;
        }
    }

    void readClosingTag(const Tag& opening) {
        if (_cursor == _end) {
            fail(opening.start, "unterminated element " + describe(opening));
        }
        const Tag closing = readTag();
        if (closing.kind != Tag::Kind::Closing || closing.element != opening.element) {
            fail(closing.start,
                 "expected </" + std::string(nameOf(opening.element)) + ">, found " + describe(closing));
        }
    }

    // ---- Text

    // The text of an element up to and including its closing tag. The result lives until the next call.
    std::string_view readText(const Tag& tag) {
        if (tag.kind == Tag::Kind::Empty) {
            return {};
        }
        const char* const start = _cursor;
        _cursor = findPlainTextEnd(_cursor, _end);
        if (left() >= 2 && _cursor[0] == '<' && _cursor[1] == '/') {
            const std::string_view text(start, static_cast<std::size_t>(_cursor - start));
            readClosingTag(tag);
            return text;
        }
        _text.assign(start, _cursor);
        return readComposedText(tag);
    }

    // The same for text that needs work: appends the rest of it to `_text`.
    std::string_view readComposedText(const Tag& tag) {
        for (;;) {
            const char* const start = _cursor;
            _cursor = findPlainTextEnd(_cursor, _end);
            _text.append(start, _cursor);
            if (_cursor == _end) {
                fail(tag.start, "unterminated element " + describe(tag));
            }
            if (*_cursor == '&') {
                appendUTF8(_text, readReference());
            } else if (*_cursor == '\r') {
                skipLineEnd();
            } else if (isNext("<![CDATA[")) {
                readCharacterData();
            } else if (isNext("<?")) {
                skipProcessingInstruction();
            } else if (!skipComment()) {
                readClosingTag(tag);
                return _text;
            }
        }
    }

    // A line end is one line feed, however it is written.
    void skipLineEnd() {
        ++_cursor;
        if (_cursor == _end || *_cursor != '\n') {
            _text += '\n';
        }
    }

    void readCharacterData() {
        const char* const start = _cursor;
        _cursor += std::string_view("<![CDATA[").size();
        const char* text = _cursor;
        skipThrough("]]>", start, "CDATA section");
        const char* const textEnd = _cursor - 3;
        const char* const after = _cursor;
        for (_cursor = text; _cursor != textEnd;) {
            if (*_cursor == '\r') {
                skipLineEnd();
            } else {
                _text += *_cursor++;
            }
        }
        _cursor = after;
    }

    char32_t readReference() {
        const char* const start = _cursor++;
        if (skip("#")) {
            return readCharacterReference(start);
        }
        const std::string_view name = readName();
        if (!skip(";")) {
            fail(start, "malformed reference");
        }
        if (name == "lt") {
            return '<';
        }
        if (name == "gt") {
            return '>';
        }
        if (name == "amp") {
            return '&';
        }
        if (name == "quot") {
            return '"';
        }
        if (name == "apos") {
            return '\'';
        }
        fail(start, "unknown entity &" + excerpt(name) + ";");
    }

    char32_t readCharacterReference(const char* start) {
        const int base = skip("x") ? 16 : 10;
        std::uint32_t number = 0;
        const auto [numberEnd, error] = std::from_chars(_cursor, _end, number, base);
        const bool isNumber = numberEnd != _cursor;
        _cursor = numberEnd;
        if (!isNumber || !skip(";")) {
            fail(start, "malformed reference");
        }
        if (error != std::errc() || !isXMLCharacter(number)) {
            fail(start, "XML has no place for the character of this reference");
        }
        return number;
    }

    static std::string_view trimmed(std::string_view text) {
        while (!text.empty() && isWhiteSpace(text.front())) {
            text.remove_prefix(1);
        }
        while (!text.empty() && isWhiteSpace(text.back())) {
            text.remove_suffix(1);
        }
        return text;
    }

    // ---- Values

    PropertyList readValue(const Tag& tag) {
        if (tag.kind == Tag::Kind::Closing) {
            fail(tag.start, "unexpected " + describe(tag));
        }
        switch (tag.element) {
        case Element::Dictionary:
            return readDictionary(tag);
        case Element::Array:
            return readArray(tag);
        case Element::String:
            return readText(tag);
        case Element::Integer:
            return readInteger(tag);
        case Element::Real:
            return readReal(tag);
        case Element::True:
            return readBoolean(tag, true);
        case Element::False:
            return readBoolean(tag, false);
        case Element::Data:
            return readData(tag);
        case Element::Date:
            return readDate(tag);
        case Element::PList:
        case Element::Key:
            break;
        }
        fail(tag.start, "expected a value, found " + describe(tag));
    }

    void enter(const Tag& tag) {
        if (++_depth > kPropertyListMaximumDepth) {
            fail(tag.start, "nested more than " + std::to_string(kPropertyListMaximumDepth) + " deep");
        }
    }

    PropertyList readDictionary(const Tag& tag) {
        PropertyList::Dictionary dictionary;
        enter(tag);
        if (tag.kind == Tag::Kind::Empty) {
            --_depth;
            return PropertyList(std::move(dictionary));
        }
        for (;;) {
            skipToTag(Element::Dictionary);
            const Tag keyTag = readTag();
            if (keyTag.kind == Tag::Kind::Closing && keyTag.element == Element::Dictionary) {
                --_depth;
                return PropertyList(std::move(dictionary));
            }
            if (keyTag.kind == Tag::Kind::Closing || keyTag.element != Element::Key) {
                fail(keyTag.start, "expected <key> or </dict>, found " + describe(keyTag));
            }
            std::string key(readText(keyTag));
            skipToTag(Element::Dictionary);
            const Tag valueTag = readTag();
            if (valueTag.kind == Tag::Kind::Closing && valueTag.element == Element::Dictionary) {
                fail(keyTag.start, "a key without a value");
            }
            // Keys mostly come in order, then the place is known.
            dictionary.insert_or_assign(dictionary.end(), std::move(key), readValue(valueTag));
        }
    }

    PropertyList readArray(const Tag& tag) {
        PropertyList::Array array;
        enter(tag);
        if (tag.kind == Tag::Kind::Empty) {
            --_depth;
            return PropertyList(std::move(array));
        }
        for (;;) {
            skipToTag(Element::Array);
            const Tag valueTag = readTag();
            if (valueTag.kind == Tag::Kind::Closing && valueTag.element == Element::Array) {
                --_depth;
                return PropertyList(std::move(array));
            }
            array.push_back(readValue(valueTag));
        }
    }

    PropertyList readInteger(const Tag& tag) {
        std::string_view digits = trimmed(readText(tag));
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
            fail(tag.start, "malformed integer");
        }
        constexpr std::uint64_t limit = std::uint64_t{1} << 63;
        if (error != std::errc() || (isNegative && magnitude > limit)) {
            fail(tag.start, "the integer does not fit 64 bits");
        }
        return isNegative ? PropertyList(static_cast<std::int64_t>(0 - magnitude)) : PropertyList(magnitude);
    }

    PropertyList readReal(const Tag& tag) {
        const std::optional<double> real = parseReal(trimmed(readText(tag)));
        if (!real) {
            fail(tag.start, "malformed real, or one out of range");
        }
        return *real;
    }

    PropertyList readBoolean(const Tag& tag, bool value) {
        if (!trimmed(readText(tag)).empty()) {
            fail(tag.start, "unexpected text in " + describe(tag));
        }
        return value;
    }

    PropertyList readDate(const Tag& tag) {
        const std::optional<PropertyList::Date> date = parseCalendarDate(trimmed(readText(tag)));
        if (!date) {
            fail(tag.start, "malformed date, or one that does not exist");
        }
        return *date;
    }

    PropertyList readData(const Tag& tag) {
        // Data may be very large: it is decoded straight from the document, unless there is markup in it.
        PropertyList::Data data;
        if (tag.kind == Tag::Kind::Empty) {
            return PropertyList(std::move(data));
        }
        const char* const start = _cursor;
        const void* const markup = std::memchr(_cursor, '<', left());
        const char* const textEnd = markup ? static_cast<const char*>(markup) : _end;
        std::size_t offset = decodeBase64({start, static_cast<std::size_t>(textEnd - start)}, data.bytes);
        const bool isReference =
            offset != std::string_view::npos && start + offset != textEnd && start[offset] == '&';
        const bool isClosed = _end - textEnd >= 2 && textEnd[1] == '/';
        if (isClosed && !isReference) {
            if (offset != std::string_view::npos) {
                fail(start + offset, "malformed base64");
            }
            _cursor = textEnd;
            readClosingTag(tag);
            return PropertyList(std::move(data));
        }
        _text.clear();
        offset = decodeBase64(readComposedText(tag), data.bytes);
        if (offset != std::string_view::npos) {
            fail(tag.start, "malformed base64");
        }
        return PropertyList(std::move(data));
    }

    const char* _begin;
    const char* _end;
    const char* _cursor;
    int _depth = 0;    // of dictionaries and arrays around the current place
    std::string _text; // text that could not be taken from the document as it stands
};

} // namespace

PropertyListReadResult readXMLPropertyList(std::string_view bytes) {
    try {
        return {XMLPropertyListReader(bytes).readDocument(), {}};
    } catch (const PropertyListReadError& error) {
        return failureAtLineAndColumn(bytes, error);
    }
}

} // namespace welcomer
