#include "propertylist/XMLScanner.h"

#include "propertylist/Characters.h"
#include "propertylist/PropertyListReadError.h"
#include "propertylist/UTF8.h"

namespace welcomer {

namespace {

constexpr std::string_view kElementNames[] = {"plist", "dict", "key",   "array", "string", "integer",
                                              "real",  "true", "false", "data",  "date"};

constexpr std::string_view nameOf(XMLElement element) {
    return kElementNames[static_cast<std::size_t>(element)];
}

constexpr bool isWhiteSpace(char character) {
    return character == ' ' || character == '\t' || character == '\n' || character == '\r';
}

constexpr bool isNameCharacter(char character) {
    return isLetterOrDigit(character) || character == '_' || character == ':' || character == '-' ||
           character == '.' || static_cast<unsigned char>(character) >= 0x80;
}

bool findElement(std::string_view name, XMLElement& element) {
    const auto is = [&](XMLElement candidate) {
        element = candidate;
        return name == nameOf(candidate);
    };
    switch (name.empty() ? 0 : name[0]) {
    case 'k':
        return is(XMLElement::Key);
    case 's':
        return is(XMLElement::String);
    case 'i':
        return is(XMLElement::Integer);
    case 'd':
        return is(XMLElement::Dictionary) || is(XMLElement::Data) || is(XMLElement::Date);
    case 'a':
        return is(XMLElement::Array);
    case 't':
        return is(XMLElement::True);
    case 'f':
        return is(XMLElement::False);
    case 'r':
        return is(XMLElement::Real);
    case 'p':
        return is(XMLElement::PList);
    default:
        return false;
    }
}

} // namespace

std::string describe(const XMLTag& tag) {
    std::string text = tag.kind == XMLTag::Kind::Closing ? "</" : "<";
    return text.append(nameOf(tag.element)).append(tag.kind == XMLTag::Kind::Empty ? "/>" : ">");
}

std::string_view trimmedXMLText(std::string_view text) {
    while (!text.empty() && isWhiteSpace(text.front())) {
        text.remove_prefix(1);
    }
    while (!text.empty() && isWhiteSpace(text.back())) {
        text.remove_suffix(1);
    }
    return text;
}

void XMLScanner::fail(const char* where, const std::string& what) const {
    throw PropertyListReadError(what, static_cast<std::size_t>(where - _begin));
}

bool XMLScanner::_skipWhiteSpace() {
    const char* const start = _cursor;
    while (_cursor != _end && isWhiteSpace(*_cursor)) {
        ++_cursor;
    }
    return _cursor != start;
}

// Moves behind the next `terminator`; `what` began at `start`.
void XMLScanner::_skipThrough(std::string_view terminator, const char* start, const char* what) {
    const std::size_t offset = std::string_view(_cursor, _left()).find(terminator);
    if (offset == std::string_view::npos) {
        fail(start, std::string("unterminated ") + what);
    }
    _cursor += offset + terminator.size();
}

void XMLScanner::_checkText() const {
    const std::string_view text(_begin, _left());
    const std::size_t offset = findInvalidXMLText(text);
    if (offset == std::string_view::npos) {
        return;
    }
    const std::string what = describeInvalidXMLText(text, offset);
    fail(_begin + offset, what.starts_with("U+") ? "XML has no place for the character " + what : what);
}

void XMLScanner::skipProlog() {
    _checkText();
    _skip("\xEF\xBB\xBF");
    _skipWhiteSpace();
    if (_isNext("<?xml") && _left() > 5 && isWhiteSpace(_cursor[5])) {
        _readDeclaration();
    }
    skipIgnorable();
    if (_isNext("<!DOCTYPE")) {
        _skipDocumentType();
        skipIgnorable();
    }
    if (_cursor == _end) {
        fail(_cursor, "no <plist> element");
    }
    if (*_cursor != '<') {
        fail(_cursor, "unexpected text before <plist>");
    }
}

void XMLScanner::_readDeclaration() {
    const char* const start = _cursor;
    _cursor += 5;
    for (;;) {
        const bool isSeparated = _skipWhiteSpace();
        if (_skip("?>")) {
            return;
        }
        const char* const attribute = _cursor;
        if (!isSeparated || _cursor == _end) {
            fail(start, "malformed XML declaration");
        }
        const auto [name, value] = _readAttribute();
        if (name == "encoding" && !equalsIgnoringCase(value, "utf-8")) {
            fail(attribute, "the encoding " + excerpt(value) + " is not supported, only UTF-8 is");
        }
    }
}

// The declaration names a grammar that nobody reads; nothing that it refers to is ever opened.
void XMLScanner::_skipDocumentType() {
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
            _skipThrough({&character, 1}, start, "document type declaration");
        }
    }
    fail(start, "unterminated document type declaration");
}

void XMLScanner::skipIgnorable() {
    for (;;) {
        _skipWhiteSpace();
        if (_left() < 2 || *_cursor != '<') {
            return;
        }
        if (_cursor[1] == '?') {
            _skipProcessingInstruction();
        } else if (_cursor[1] != '!' || !_skipComment()) {
            return;
        }
    }
}

void XMLScanner::_skipProcessingInstruction() {
    const char* const start = _cursor;
    _cursor += 2;
    const std::string_view target = _readName();
    if (target.empty()) {
        fail(start, "a processing instruction without a name");
    }
    if (equalsIgnoringCase(target, "xml")) {
        fail(start, "an XML declaration may stand at the beginning only");
    }
    _skipThrough("?>", start, "processing instruction");
}

bool XMLScanner::_skipComment() {
    const char* const start = _cursor;
    if (!_skip("<!--")) {
        return false;
    }
    _skipThrough("--", start, "comment");
    if (!_skip(">")) {
        fail(_cursor - 2, "\"--\" within a comment");
    }
    return true;
}

void XMLScanner::skipToTag(XMLElement parent) {
    skipIgnorable();
    if (_cursor == _end) {
        fail(_cursor, "the document ends within " + describe({XMLTag::Kind::Opening, parent, nullptr}));
    }
    if (*_cursor != '<') {
        fail(_cursor, "unexpected text in " + describe({XMLTag::Kind::Opening, parent, nullptr}));
    }
}

std::string_view XMLScanner::_readName() {
    const char* const start = _cursor;
    while (_cursor != _end && isNameCharacter(*_cursor)) {
        ++_cursor;
    }
    return {start, static_cast<std::size_t>(_cursor - start)};
}

XMLScanner::Attribute XMLScanner::_readAttribute() {
    const char* const start = _cursor;
    const std::string_view name = _readName();
    _skipWhiteSpace();
    if (name.empty() || !_skip("=")) {
        fail(start, "malformed attribute");
    }
    _skipWhiteSpace();
    if (_cursor == _end || (*_cursor != '"' && *_cursor != '\'')) {
        fail(start, "the value of an attribute must be quoted");
    }
    const char quote = *_cursor++;
    const char* const value = _cursor;
    _skipThrough({&quote, 1}, start, "attribute");
    const std::string_view text(value, static_cast<std::size_t>(_cursor - 1 - value));
    if (text.find('<') != std::string_view::npos) {
        fail(value + text.find('<'), "\"<\" within an attribute");
    }
    return {name, text};
}

XMLTag XMLScanner::readTag() {
    const char* const start = _cursor++;
    XMLTag tag{XMLTag::Kind::Opening, XMLElement::PList, start};
    if (_skip("/")) {
        tag.kind = XMLTag::Kind::Closing;
    }
    const std::string_view name = _readName();
    if (!findElement(name, tag.element)) {
        _failAtUnknownTag(start, name);
    }
    if (_skip(">")) {
        return tag;
    }
    _readRestOfTag(tag);
    return tag;
}

void XMLScanner::_failAtUnknownTag(const char* start, std::string_view name) const {
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

void XMLScanner::_readRestOfTag(XMLTag& tag) {
    for (;;) {
        const bool isSeparated = _skipWhiteSpace();
        if (_skip(">")) {
            return;
        }
        if (tag.kind == XMLTag::Kind::Opening && _skip("/>")) {
            tag.kind = XMLTag::Kind::Empty;
            return;
        }
        if (tag.kind == XMLTag::Kind::Closing || !isSeparated || _cursor == _end) {
            fail(tag.start, "malformed tag " + describe(tag));
        }
        _readAttribute();
    }
}

void XMLScanner::readClosingTag(const XMLTag& opening) {
    if (_cursor == _end) {
        fail(opening.start, "unterminated element " + describe(opening));
    }
    const XMLTag closing = readTag();
    if (!closing.isClosing(opening.element)) {
        fail(closing.start,
             "expected </" + std::string(nameOf(opening.element)) + ">, found " + describe(closing));
    }
}

} // namespace welcomer
