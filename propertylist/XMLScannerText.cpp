// The scanner's part that reads the text of elements.

#include "propertylist/PropertyListReadError.h"
#include "propertylist/UTF8.h"
#include "propertylist/XMLScanner.h"

#include <algorithm>
#include <bit>
#include <charconv>
#include <cstdint>

namespace welcomer {

namespace {

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

} // namespace

std::string_view XMLScanner::readText(const XMLTag& tag) {
    if (tag.kind == XMLTag::Kind::Empty) {
        return {};
    }
    const char* const start = _cursor;
    _cursor = findPlainTextEnd(_cursor, _end);
    if (_left() >= 2 && _cursor[0] == '<' && _cursor[1] == '/') {
        const std::string_view text(start, static_cast<std::size_t>(_cursor - start));
        readClosingTag(tag);
        return text;
    }
    _text.assign(start, _cursor);
    return _readComposedText(tag);
}

std::optional<std::string_view> XMLScanner::peekRawText() const {
    const void* const markup = std::memchr(_cursor, '<', _left());
    const char* const textEnd = markup ? static_cast<const char*>(markup) : _end;
    if (_end - textEnd < 2 || textEnd[1] != '/') {
        return std::nullopt;
    }
    return std::string_view(_cursor, static_cast<std::size_t>(textEnd - _cursor));
}

// The same for text that needs work: appends the rest of it to `_text`.
std::string_view XMLScanner::_readComposedText(const XMLTag& tag) {
    for (;;) {
        const char* const start = _cursor;
        _cursor = findPlainTextEnd(_cursor, _end);
        _text.append(start, _cursor);
        if (_cursor == _end) {
            fail(tag.start, "unterminated element " + describe(tag));
        }
        if (*_cursor == '&') {
            appendUTF8(_text, _readReference());
        } else if (*_cursor == '\r') {
            _skipLineEnd();
        } else if (_isNext("<![CDATA[")) {
            _readCharacterData();
        } else if (_isNext("<?")) {
            _skipProcessingInstruction();
        } else if (!_skipComment()) {
            readClosingTag(tag);
            return _text;
        }
    }
}

// A line end is one line feed, however it is written.
void XMLScanner::_skipLineEnd() {
    ++_cursor;
    if (_cursor == _end || *_cursor != '\n') {
        _text += '\n';
    }
}

void XMLScanner::_readCharacterData() {
    const char* const start = _cursor;
    _cursor += std::string_view("<![CDATA[").size();
    const char* text = _cursor;
    _skipThrough("]]>", start, "CDATA section");
    const char* const textEnd = _cursor - 3;
    const char* const after = _cursor;
    for (_cursor = text; _cursor != textEnd;) {
        if (*_cursor == '\r') {
            _skipLineEnd();
        } else {
            _text += *_cursor++;
        }
    }
    _cursor = after;
}

char32_t XMLScanner::_readReference() {
    const char* const start = _cursor++;
    if (_skip("#")) {
        return _readCharacterReference(start);
    }
    const std::string_view name = _readName();
    if (!_skip(";")) {
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

char32_t XMLScanner::_readCharacterReference(const char* start) {
    const int base = _skip("x") ? 16 : 10;
    std::uint32_t number = 0;
    const auto [numberEnd, error] = std::from_chars(_cursor, _end, number, base);
    const bool isNumber = numberEnd != _cursor;
    _cursor = numberEnd;
    if (!isNumber || !_skip(";")) {
        fail(start, "malformed reference");
    }
    if (error != std::errc() || !isXMLCharacter(number)) {
        fail(start, "XML has no place for the character of this reference");
    }
    return number;
}

} // namespace welcomer
