#include "propertylist/TextPropertyListReader.h"

#include "propertylist/Characters.h"
#include "propertylist/PropertyListReadError.h"
#include "propertylist/UTF8.h"

#include <algorithm>

namespace welcomer {

namespace {

constexpr bool isWhiteSpace(char character) {
    return character == ' ' || (character >= '\t' && character <= '\r');
}

constexpr bool isWordCharacter(char character) {
    return isLetterOrDigit(character) || std::string_view("_$/:.-").find(character) != std::string_view::npos;
}

// The value of a hexadecimal digit, or 16 when the character is none.
constexpr unsigned hexadecimalDigit(char character) {
    if (character >= '0' && character <= '9') {
        return static_cast<unsigned>(character - '0');
    }
    const char lower = toLower(character);
    return lower >= 'a' && lower <= 'f' ? static_cast<unsigned>(lower - 'a' + 10) : 16;
}

class TextPropertyListReader {
  public:
    explicit TextPropertyListReader(std::string_view bytes) : _bytes(bytes) {}

    PropertyList readDocument() {
        if (const std::size_t offset = findInvalidUTF8(_bytes); offset != std::string_view::npos) {
            _fail(offset, "invalid UTF-8");
        }
        _skip("\xEF\xBB\xBF");
        _skipIgnorable();
        if (_isAtEnd()) {
            _fail(_offset, "there is no value");
        }
        const std::size_t start = _offset;
        PropertyList value = _readValue();
        _skipIgnorable();
        if (value.isString() && _isNext("=")) {
            _offset = start;
            ++_depth;
            return _readEntries("");
        }
        if (!_isAtEnd()) {
            _fail(_offset, "unexpected content after the top-level value");
        }
        return value;
    }

  private:
    [[noreturn]] static void _fail(std::size_t offset, const std::string& what) {
        throw PropertyListReadError(what, offset);
    }

    bool _isAtEnd() const { return _offset == _bytes.size(); }
    char _current() const { return _bytes[_offset]; }
    bool _isNext(std::string_view text) const { return _bytes.substr(_offset).starts_with(text); }

    bool _skip(std::string_view text) {
        const bool found = _isNext(text);
        if (found) {
            _offset += text.size();
        }
        return found;
    }

    // Passes over white space and comments.
    void _skipIgnorable() {
        while (!_isAtEnd()) {
            const std::size_t start = _offset;
            if (isWhiteSpace(_current())) {
                ++_offset;
            } else if (_skip("//")) {
                _offset = std::min(_bytes.find_first_of("\r\n", _offset), _bytes.size());
            } else if (_skip("/*")) {
                const std::size_t end = _bytes.find("*/", _offset);
                if (end == std::string_view::npos) {
                    _fail(start, "unterminated comment");
                }
                _offset = end + 2;
            } else {
                return;
            }
        }
    }

    void _expect(std::string_view text) {
        _skipIgnorable();
        if (!_skip(text)) {
            _fail(_offset, "expected \"" + std::string(text) + "\", found " + _describeNext());
        }
    }

    std::string _describeNext() const {
        return _isAtEnd() ? "the end" : "\"" + excerpt(_bytes.substr(_offset, 1)) + "\"";
    }

    void _enter() {
        if (++_depth > kPropertyListMaximumDepth) {
            _fail(_offset, "nested more than " + std::to_string(kPropertyListMaximumDepth) + " deep");
        }
    }

    // Reads the value at the next place that is not to be ignored.
    PropertyList _readValue() {
        _skipIgnorable();
        if (_isNext("{")) {
            _enter();
            ++_offset;
            return _readEntries("}");
        }
        if (_isNext("(")) {
            return _readArray();
        }
        if (_isNext("<")) {
            return _readData();
        }
        return _readString();
    }

    // Reads the entries of a dictionary through its `end`, or to the end of the document if that is empty.
    PropertyList _readEntries(std::string_view end) {
        PropertyList::Dictionary dictionary;
        for (;;) {
            _skipIgnorable();
            if (end.empty() ? _isAtEnd() : _skip(end)) {
                --_depth;
                return PropertyList(std::move(dictionary));
            }
            std::string key = _readString();
            _expect("=");
            PropertyList value = _readValue();
            _expect(";");
            dictionary.insert_or_assign(std::move(key), std::move(value));
        }
    }

    PropertyList _readArray() {
        _enter();
        ++_offset;
        PropertyList::Array array;
        for (;;) {
            _skipIgnorable();
            if (_skip(")")) {
                break;
            }
            array.push_back(_readValue());
            _skipIgnorable();
            if (!_skip(",")) {
                _expect(")");
                break;
            }
        }
        --_depth;
        return PropertyList(std::move(array));
    }

    PropertyList _readData() {
        const std::size_t start = _offset++;
        PropertyList::Data data;
        unsigned high = 16; // the first digit of a byte, 16 before it
        for (; !_isAtEnd(); ++_offset) {
            if (isWhiteSpace(_current())) {
                continue;
            }
            if (_current() == '>') {
                if (high != 16) {
                    _fail(_offset, "data ends within a byte");
                }
                ++_offset;
                return PropertyList(std::move(data));
            }
            const unsigned digit = hexadecimalDigit(_current());
            if (digit == 16) {
                _fail(_offset, "expected a hexadecimal digit, found " + _describeNext());
            }
            if (high == 16) {
                high = digit;
            } else {
                data.bytes += static_cast<char>(high << 4 | digit);
                high = 16;
            }
        }
        _fail(start, "unterminated data");
    }

    // A quoted string or a word.
    std::string _readString() {
        if (_isNext("\"") || _isNext("'")) {
            return _readQuotedString();
        }
        const std::size_t start = _offset;
        // Slashes belong to the word, so that addresses need no quotes; an asterisk cannot.
        while (!_isAtEnd() && isWordCharacter(_current()) && !_isNext("/*")) {
            ++_offset;
        }
        if (_offset == start) {
            _fail(start, "expected a value, found " + _describeNext());
        }
        return std::string(_bytes.substr(start, _offset - start));
    }

    std::string _readQuotedString() {
        const std::size_t start = _offset;
        const char quote = _bytes[_offset++];
        const char endings[] = {quote, '\\'};
        std::string text;
        for (;;) {
            const std::size_t end = _bytes.find_first_of({endings, 2}, _offset);
            if (end == std::string_view::npos) {
                _fail(start, "unterminated string");
            }
            text += _bytes.substr(_offset, end - _offset);
            _offset = end + 1;
            if (_bytes[end] == quote) {
                return text;
            }
            if (_isAtEnd()) {
                _fail(start, "unterminated string");
            }
            _readEscape(text, end);
        }
    }

    // Reads what follows a backslash, which stands at `start`.
    void _readEscape(std::string& text, std::size_t start) {
        const char character = _current();
        if (character >= '0' && character <= '7') {
            appendUTF8(text, readDigits(3, 8, start));
            return;
        }
        ++_offset;
        switch (character) {
        case 'a':
            text += '\a';
            break;
        case 'b':
            text += '\b';
            break;
        case 'f':
            text += '\f';
            break;
        case 'n':
            text += '\n';
            break;
        case 'r':
            text += '\r';
            break;
        case 't':
            text += '\t';
            break;
        case 'v':
            text += '\v';
            break;
        case 'U':
            appendUTF8(text, readUTF16(start));
            break;
        default:
            text += character;
            break;
        }
    }

    // Reads at least one and at most `most` digits of an escape.
    char32_t readDigits(int most, unsigned base, std::size_t start) {
        char32_t value = 0;
        int count = 0;
        for (; count < most && !_isAtEnd() && hexadecimalDigit(_current()) < base; ++count, ++_offset) {
            value = value * base + hexadecimalDigit(_current());
        }
        if (count == 0) {
            _fail(start, "an escape without digits");
        }
        return value;
    }

    // Reads the unit of a \U escape and, when it is the first half of a pair, the escape after it.
    char32_t readUTF16(std::size_t start) {
        const char32_t unit = readDigits(4, 16, start);
        if (isHighSurrogate(unit) && _skip("\\U")) {
            const char32_t low = readDigits(4, 16, start);
            if (isLowSurrogate(low)) {
                return joinSurrogates(unit, low);
            }
        }
        if (isHighSurrogate(unit) || isLowSurrogate(unit)) {
            _fail(start, "half a surrogate pair");
        }
        return unit;
    }

    const std::string_view _bytes;
    std::size_t _offset = 0;
    int _depth = 0; // of dictionaries and arrays around the current place
};

} // namespace

PropertyListReadResult readTextPropertyList(std::string_view bytes) {
    try {
        return {TextPropertyListReader(bytes).readDocument(), {}};
    } catch (const PropertyListReadError& error) {
        return failureAtLineAndColumn(bytes, error);
    }
}

} // namespace welcomer
