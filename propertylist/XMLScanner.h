// The markup of a property list in the XML format: its prolog, its tags, and the text between them.

#pragma once

#include <cstddef>
#include <cstring>
#include <optional>
#include <string>
#include <string_view>

namespace welcomer {

enum class XMLElement { PList, Dictionary, Key, Array, String, Integer, Real, True, False, Data, Date };

struct XMLTag {
    enum class Kind { Opening, Closing, Empty };
    Kind kind;
    XMLElement element;
    const char* start; // its '<'

    bool isClosing(XMLElement of) const { return kind == Kind::Closing && element == of; }
};

// A tag as a message shows it.
std::string describe(const XMLTag& tag);

// Without the white space at both ends.
std::string_view trimmedXMLText(std::string_view text);

// Goes through one document from its beginning to its end. Whatever is not well formed, or no part of a
// property list, is thrown as a PropertyListReadError. Borrows the document.
class XMLScanner {
  public:
    explicit XMLScanner(std::string_view document)
        : _begin(document.data()),
          _end(document.data() + document.size()),
          _cursor(_begin) {}

    // Passes over everything before the first tag, and checks that all of the document is text that XML can
    // hold.
    void skipProlog();

    // Passes over white space, comments and processing instructions.
    void skipIgnorable();

    // Passes over what may stand between the tags in the content of `parent`.
    void skipToTag(XMLElement parent);

    // Reads the tag that begins here, at a '<'.
    XMLTag readTag();

    // Reads the tag that has to close `opening`.
    void readClosingTag(const XMLTag& opening);

    // The text of an element up to and including its closing tag. The result lives until the next call.
    std::string_view readText(const XMLTag& tag);

    // The text up to the next markup as it stands in the document, with references and carriage returns in
    // it; none unless that markup is a closing tag.
    std::optional<std::string_view> peekRawText() const;
    void skipRawText(std::string_view text) { _cursor = text.data() + text.size(); }

    // Where the scanner is, and whether that is the document's end.
    const char* place() const { return _cursor; }
    bool isAtEnd() const { return _cursor == _end; }

    // Throws the error, which is at this place of the document.
    [[noreturn]] void fail(const char* where, const std::string& what) const;

  private:
    struct Attribute {
        std::string_view name;
        std::string_view value; // as it stands, references not resolved
    };

    std::size_t _left() const { return static_cast<std::size_t>(_end - _cursor); }
    bool _isNext(std::string_view text) const {
        return _left() >= text.size() && std::memcmp(_cursor, text.data(), text.size()) == 0;
    }
    bool _skip(std::string_view text) {
        const bool found = _isNext(text);
        if (found) {
            _cursor += text.size();
        }
        return found;
    }
    bool _skipWhiteSpace();
    void _skipThrough(std::string_view terminator, const char* start, const char* what);

    void _checkText() const;
    void _readDeclaration();
    void _skipDocumentType();
    void _skipProcessingInstruction();
    bool _skipComment();

    std::string_view _readName();
    Attribute _readAttribute();
    void _readRestOfTag(XMLTag& tag);
    [[noreturn]] void _failAtUnknownTag(const char* start, std::string_view name) const;

    std::string_view _readComposedText(const XMLTag& tag);
    void _skipLineEnd();
    void _readCharacterData();
    char32_t _readReference();
    char32_t _readCharacterReference(const char* start);

    const char* _begin;
    const char* _end;
    const char* _cursor;
    std::string _text; // text that could not be taken from the document as it stands
};

} // namespace welcomer
