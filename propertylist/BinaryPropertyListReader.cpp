#include "propertylist/BinaryPropertyListReader.h"

#include "propertylist/PropertyListReadError.h"
#include "propertylist/UTF8.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstdint>
#include <vector>

namespace welcomer {

namespace {

constexpr std::size_t kHeaderSize = 8;
constexpr std::size_t kTrailerSize = 32;

// The format counts dates from 2001-01-01T00:00:00Z.
constexpr double kSecondsFrom1970To2001 = 978307200;

// See the header: what may be made beyond what the size of the input accounts for.
constexpr std::uint64_t kSharedValues = 65536;
constexpr std::uint64_t kSharedContent = std::uint64_t{64} << 20;
constexpr std::uint64_t kContentPerByte = 16;

class BinaryPropertyListReader {
  public:
    explicit BinaryPropertyListReader(std::string_view bytes)
        : _bytes(bytes),
          _valuesLeft(bytes.size() + kSharedValues),
          _contentLeft(bytes.size() * kContentPerByte + kSharedContent) {}

    PropertyList readDocument() {
        _readTrailer();
        _isOpen.assign(_objectCount, false);
        return _readObject(_topObject, _trailerOffset);
    }

  private:
    [[noreturn]] static void _fail(std::size_t offset, const std::string& what) {
        throw PropertyListReadError(what, offset);
    }

    // A big-endian number of up to 8 bytes, which must be there.
    std::uint64_t number(std::size_t offset, std::size_t size) const {
        std::uint64_t value = 0;
        for (const char byte : _bytes.substr(offset, size)) {
            value = value << 8 | static_cast<unsigned char>(byte);
        }
        return value;
    }

    void _readTrailer() {
        if (!_bytes.starts_with("bplist00")) {
            _fail(0, "not version 00 of the binary format");
        }
        if (_bytes.size() < kHeaderSize + kTrailerSize) {
            _fail(_bytes.size(), "the data is too short for a binary property list");
        }
        _trailerOffset = _bytes.size() - kTrailerSize;
        _offsetSize = number(_trailerOffset + 6, 1);
        _referenceSize = number(_trailerOffset + 7, 1);
        const std::uint64_t objectCount = number(_trailerOffset + 8, 8);
        const std::uint64_t topObject = number(_trailerOffset + 16, 8);
        const std::uint64_t tableOffset = number(_trailerOffset + 24, 8);
        if (_offsetSize < 1 || _offsetSize > 8) {
            _fail(_trailerOffset + 6, "offsets of " + std::to_string(_offsetSize) + " bytes");
        }
        if (_referenceSize < 1 || _referenceSize > 8) {
            _fail(_trailerOffset + 7, "references of " + std::to_string(_referenceSize) + " bytes");
        }
        if (tableOffset < kHeaderSize || tableOffset > _trailerOffset) {
            _fail(_trailerOffset + 24, "the offset table lies outside the data");
        }
        _tableOffset = static_cast<std::size_t>(tableOffset);
        const std::size_t tableSize = _trailerOffset - _tableOffset;
        if (tableSize % _offsetSize != 0 || objectCount != tableSize / _offsetSize) {
            _fail(_trailerOffset + 8, "the offset table does not end where the trailer begins");
        }
        _objectCount = static_cast<std::size_t>(objectCount);
        if (topObject >= _objectCount) {
            _fail(_trailerOffset + 16, "there is no object " + std::to_string(topObject));
        }
        _topObject = static_cast<std::size_t>(topObject);
    }

    // The head of an object: what it is, and where its content begins.
    struct Object {
        std::size_t offset = 0;
        unsigned kind = 0; // the upper half of the marker
        unsigned info = 0; // the lower half
        std::size_t content = 0;
    };

    // The object with an index, which is below the object count.
    Object _findObject(std::size_t index) const {
        const std::size_t entry = _tableOffset + index * _offsetSize;
        const std::uint64_t offset = number(entry, _offsetSize);
        if (offset < kHeaderSize || offset >= _tableOffset) {
            _fail(entry, "object " + std::to_string(index) + " lies outside the data");
        }
        const unsigned marker = static_cast<unsigned char>(_bytes[static_cast<std::size_t>(offset)]);
        return {static_cast<std::size_t>(offset), marker >> 4, marker & 15,
                static_cast<std::size_t>(offset) + 1};
    }

    // Makes sure that `count` items of `size` bytes each lie between `offset` and the offset table.
    void _requireContent(const Object& object, std::uint64_t count, std::size_t size) const {
        if (count > (_tableOffset - object.content) / size) {
            _fail(object.offset, "the object reaches beyond the objects' end");
        }
    }

    // The number of items of an object; moves the content behind a count that stands apart.
    std::size_t _readCount(Object& object) const {
        std::uint64_t count = object.info;
        if (count == 15) {
            _requireContent(object, 1, 1);
            const unsigned marker = static_cast<unsigned char>(_bytes[object.content]);
            const std::size_t size = std::size_t{1} << (marker & 15);
            if (marker >> 4 != 1 || size > 8) {
                _fail(object.content, "malformed count");
            }
            ++object.content;
            _requireContent(object, size, 1);
            count = number(object.content, size);
            object.content += size;
        }
        _requireContent(object, count, 1);
        return static_cast<std::size_t>(count);
    }

    void _spend(std::uint64_t& left, std::uint64_t amount, const Object& object) const {
        if (amount > left) {
            _fail(object.offset, "shared objects make more than the input accounts for");
        }
        left -= amount;
    }

    // The index that the reference at `offset` holds.
    std::size_t _readReference(std::size_t offset) const {
        const std::uint64_t index = number(offset, _referenceSize);
        if (index >= _objectCount) {
            _fail(offset, "there is no object " + std::to_string(index));
        }
        return static_cast<std::size_t>(index);
    }

    // Reads an object; the reference to it stands at `referenceOffset`.
    PropertyList _readObject(std::size_t index, std::size_t referenceOffset) {
        Object object = _findObject(index);
        switch (object.kind) {
        case 0x0:
            return _readSingleton(object);
        case 0x1:
            return _readInteger(object);
        case 0x2:
            return _readReal(object);
        case 0x3:
            return _readDate(object);
        case 0x4:
            return _readData(object);
        case 0x5:
        case 0x6:
            return _readString(object);
        case 0x8:
            _fail(object.offset, "a UID is no property-list value");
        case 0xA:
        case 0xD:
            return _readContainer(object, index, referenceOffset);
        default:
            _fail(object.offset, "unknown kind of object");
        }
    }

    static PropertyList _readSingleton(const Object& object) {
        if (object.info == 8 || object.info == 9) {
            return object.info == 9;
        }
        _fail(object.offset, object.info == 0 ? "null is no property-list value" : "unknown kind of object");
    }

    PropertyList _readInteger(const Object& object) const {
        if (object.info > 4) {
            _fail(object.offset, "malformed integer");
        }
        const std::size_t size = std::size_t{1} << object.info;
        _requireContent(object, size, 1);
        // Shorter integers are unsigned; those of 8 and 16 bytes are signed.
        if (size < 8) {
            return number(object.content, size);
        }
        const std::uint64_t low = number(object.content + size - 8, 8);
        if (size == 8) {
            return static_cast<std::int64_t>(low);
        }
        const std::uint64_t high = number(object.content, 8);
        if (high == 0) {
            return low;
        }
        if (high == ~std::uint64_t{0} && low >> 63 == 1) {
            return static_cast<std::int64_t>(low);
        }
        _fail(object.offset, "the integer does not fit 64 bits");
    }

    PropertyList _readReal(const Object& object) const {
        if (object.info == 2) {
            _requireContent(object, 4, 1);
            return std::bit_cast<float>(static_cast<std::uint32_t>(number(object.content, 4)));
        }
        if (object.info != 3) {
            _fail(object.offset, "malformed real");
        }
        _requireContent(object, 8, 1);
        return std::bit_cast<double>(number(object.content, 8));
    }

    PropertyList _readDate(const Object& object) const {
        if (object.info != 3) {
            _fail(object.offset, "malformed date");
        }
        _requireContent(object, 8, 1);
        const auto secondsSince2001 = std::bit_cast<double>(number(object.content, 8));
        if (!std::isfinite(secondsSince2001)) {
            _fail(object.offset, "the date is not finite");
        }
        return PropertyList::Date{secondsSince2001 + kSecondsFrom1970To2001};
    }

    PropertyList _readData(Object& object) {
        const std::size_t count = _readCount(object);
        _spend(_contentLeft, count, object);
        return PropertyList::Data{std::string(_bytes.substr(object.content, count))};
    }

    // Reads an ASCII or a UTF-16 string.
    std::string _readString(Object& object) {
        const std::size_t count = _readCount(object);
        if (object.kind == 0x6) {
            return _readUTF16(object, count);
        }
        _spend(_contentLeft, count, object);
        const std::string_view text = _bytes.substr(object.content, count);
        const auto isASCII = [](char character) {
            return static_cast<unsigned char>(character) < 0x80;
        };
        if (const auto other = std::find_if_not(text.begin(), text.end(), isASCII); other != text.end()) {
            _fail(object.content + static_cast<std::size_t>(other - text.begin()),
                  "an ASCII string holds other bytes");
        }
        return std::string(text);
    }

    std::string _readUTF16(const Object& object, std::size_t count) {
        _requireContent(object, count, 2);
        _spend(_contentLeft, std::uint64_t{count} * 3, object);
        std::string text;
        text.reserve(count);
        for (std::size_t index = 0; index < count; ++index) {
            const std::size_t offset = object.content + index * 2;
            auto character = static_cast<char32_t>(number(offset, 2));
            if (isHighSurrogate(character) && index + 1 < count) {
                const auto low = static_cast<char32_t>(number(offset + 2, 2));
                if (isLowSurrogate(low)) {
                    character = joinSurrogates(character, low);
                    ++index;
                }
            }
            if (isHighSurrogate(character) || isLowSurrogate(character)) {
                _fail(offset, "half a surrogate pair");
            }
            appendUTF8(text, character);
        }
        return text;
    }

    PropertyList _readContainer(Object& object, std::size_t index, std::size_t referenceOffset) {
        if (_isOpen[index]) {
            _fail(referenceOffset, "an object contains itself");
        }
        if (_depth == kPropertyListMaximumDepth) {
            _fail(object.offset, "nested more than " + std::to_string(kPropertyListMaximumDepth) + " deep");
        }
        const std::size_t count = _readCount(object);
        _isOpen[index] = true;
        ++_depth;
        PropertyList value = object.kind == 0xA ? _readArray(object, count) : _readDictionary(object, count);
        --_depth;
        _isOpen[index] = false;
        return value;
    }

    PropertyList _readArray(const Object& object, std::size_t count) {
        _requireContent(object, count, _referenceSize);
        _spend(_valuesLeft, count, object);
        PropertyList::Array array;
        array.reserve(count);
        for (std::size_t element = 0; element < count; ++element) {
            const std::size_t reference = object.content + element * _referenceSize;
            array.push_back(_readObject(_readReference(reference), reference));
        }
        return PropertyList(std::move(array));
    }

    // References to all keys come first, then those to the values in the same order.
    PropertyList _readDictionary(const Object& object, std::size_t count) {
        _requireContent(object, count, 2 * _referenceSize);
        _spend(_valuesLeft, std::uint64_t{count} * 2, object);
        PropertyList::Dictionary dictionary;
        for (std::size_t entry = 0; entry < count; ++entry) {
            const std::size_t keyReference = object.content + entry * _referenceSize;
            const std::size_t valueReference = keyReference + count * _referenceSize;
            Object key = _findObject(_readReference(keyReference));
            if (key.kind != 0x5 && key.kind != 0x6) {
                _fail(keyReference, "a key is no string");
            }
            std::string name = _readString(key);
            dictionary.insert_or_assign(dictionary.end(), std::move(name),
                                        _readObject(_readReference(valueReference), valueReference));
        }
        return PropertyList(std::move(dictionary));
    }

    std::string_view _bytes;
    std::size_t _trailerOffset = 0;
    std::size_t _tableOffset = 0; // of the table of the objects' offsets; the objects end there
    std::size_t _offsetSize = 0;  // in bytes
    std::size_t _referenceSize = 0;
    std::size_t _objectCount = 0;
    std::size_t _topObject = 0;
    std::vector<bool> _isOpen; // the containers around the current place
    int _depth = 0;            // how many they are
    std::uint64_t _valuesLeft;
    std::uint64_t _contentLeft; // in bytes
};

} // namespace

PropertyListReadResult readBinaryPropertyList(std::string_view bytes) {
    try {
        return {BinaryPropertyListReader(bytes).readDocument(), {}};
    } catch (const PropertyListReadError& error) {
        return failureAtByteOffset(error);
    }
}

} // namespace welcomer
