#include "backends/accountserver/JSONPropertyList.h"

#include "backends/accountserver/Protocol.h"
#include "propertylist/PropertyListReadError.h"
#include "propertylist/RealText.h"
#include "propertylist/UTF8.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <nlohmann/json.hpp>
#include <utility>
#include <vector>

namespace welcomer::accountserver {

namespace {

using Parser = nlohmann::json;

// Builds the value as the parser goes. Each function answers whether to go on; where one does not, `error`
// says why.
class Builder {
  public:
    explicit Builder(std::string_view bytes) : _bytes(bytes) {}

    bool null() {
        if (_open.empty() || !_open.back().value.isDictionary()) {
            return _refuse("is null");
        }
        _open.back().nulls.push_back(_open.back().key);
        return _count();
    }
    bool boolean(bool value) { return _add(value); }
    bool number_integer(std::int64_t value) { return _add(value); }
    bool number_unsigned(std::uint64_t value) { return _add(value); }
    bool number_float(double value, const std::string& text) {
        return text.find_first_of(".eE") == std::string::npos
                   ? _refuse("is an integer that does not fit 64 bits")
                   : _add(value);
    }
    bool string(std::string& value) { return _add(std::move(value)); }
    bool binary(std::vector<std::uint8_t>& /*value*/) { return false; } // not in text
    bool start_object(std::size_t /*size*/) { return _begin(PropertyList::Dictionary()); }
    bool end_object() { return _end(); }
    bool start_array(std::size_t /*size*/) { return _begin(PropertyList::Array()); }
    bool end_array() { return _end(); }

    bool key(std::string& name) {
        Open& object = _open.back();
        object.key = std::move(name);
        const bool isRepeated = object.value.find(object.key) != nullptr ||
                                std::ranges::find(object.nulls, object.key) != object.nulls.end();
        return !isRepeated || _refuse("appears twice");
    }

    template <class Exception>
    bool parse_error(std::size_t position, const std::string& /*token*/, const Exception& exception) {
        constexpr int numberOutOfRange = 406;
        const char* const what = exception.id == numberOutOfRange ? "a number is out of range"
                                 : position > _bytes.size()       ? "the text ends too early"
                                                                  : "this is not JSON";
        const std::size_t offset = std::min(position == 0 ? 0 : position - 1, _bytes.size());
        error = failureAtLineAndColumn(_bytes, PropertyListReadError(what, offset)).error;
        return false;
    }

    std::string error;
    PropertyList result;

  private:
    // An object or array that is not complete yet.
    struct Open {
        PropertyList value;
        std::string key;                // of an object: the one whose value comes next
        std::vector<std::string> nulls; // of an object: the keys that were left out
    };

    bool _begin(PropertyList value) {
        if (static_cast<int>(_open.size()) >= kMaximumJSONDepth) {
            return _refuse("is nested more than " + std::to_string(kMaximumJSONDepth) + " deep");
        }
        _open.push_back({std::move(value), {}, {}});
        return _count();
    }

    bool _end() {
        PropertyList value = std::move(_open.back().value);
        _open.pop_back();
        _place(std::move(value));
        return true;
    }

    bool _add(PropertyList value) {
        _place(std::move(value));
        return _count();
    }

    void _place(PropertyList value) {
        if (_open.empty()) {
            result = std::move(value);
        } else if (PropertyList::Array* const array = _open.back().value.array()) {
            array->push_back(std::move(value));
        } else {
            _open.back().value.dictionary()->emplace(_open.back().key, std::move(value));
        }
    }

    bool _count() {
        if (++_values > kMaximumJSONValues) {
            error = "there are more than " + std::to_string(kMaximumJSONValues) + " values";
        }
        return error.empty();
    }

    // The place of what comes next, as a path of keys and numbers.
    bool _refuse(const std::string& why) {
        std::string path;
        for (const Open& each : _open) {
            const PropertyList::Array* const array = each.value.array();
            path += (path.empty() ? "" : "/") + (array ? std::to_string(array->size()) : excerpt(each.key));
        }
        error = (path.empty() ? "the top value" : path) + " " + why;
        return false;
    }

    const std::string_view _bytes;
    std::vector<Open> _open; // the outermost first
    std::size_t _values = 0;
};

// Thrown within the writer only.
struct Unwritable {
    std::string path;
    const char* why;
};

class Writer {
  public:
    std::string text;

    void write(const PropertyList& value, int depth = 0) {
        switch (value.type()) {
        case PropertyList::Type::Dictionary:
            return _writeDictionary(*value.dictionary(), depth);
        case PropertyList::Type::Array:
            return _writeArray(*value.array(), depth);
        case PropertyList::Type::String:
            return _writeString(*value.string());
        case PropertyList::Type::Integer:
            text +=
                value.integer() ? std::to_string(*value.integer()) : std::to_string(*value.unsignedInteger());
            return;
        case PropertyList::Type::Real:
            return _writeReal(*value.real());
        case PropertyList::Type::Boolean:
            text += *value.boolean() ? "true" : "false";
            return;
        case PropertyList::Type::Data:
            throw Unwritable{{}, "is data, for which JSON has no place"};
        case PropertyList::Type::Date:
            throw Unwritable{{}, "is a date, for which JSON has no place"};
        }
    }

  private:
    void _writeDictionary(const PropertyList::Dictionary& dictionary, int depth) {
        _checkDepth(depth);
        char separator = '{';
        for (const auto& [key, value] : dictionary) {
            text += separator;
            separator = ',';
            _within(excerpt(key), [&, &name = key, &content = value] {
                _writeString(name);
                text += ':';
                write(content, depth + 1);
            });
        }
        text += dictionary.empty() ? "{}" : "}";
    }

    void _writeArray(const PropertyList::Array& array, int depth) {
        _checkDepth(depth);
        for (std::size_t i = 0; i < array.size(); ++i) {
            text += i == 0 ? '[' : ',';
            _within(std::to_string(i), [&] { write(array[i], depth + 1); });
        }
        text += array.empty() ? "[]" : "]";
    }

    template <class Write>
    static void _within(const std::string& place, const Write& write) {
        try {
            write();
        } catch (Unwritable& unwritable) {
            unwritable.path.insert(0, unwritable.path.empty() ? place : place + "/");
            throw;
        }
    }

    static void _checkDepth(int depth) {
        if (depth >= kMaximumJSONDepth) {
            throw Unwritable{{}, "is nested too deep for JSON"};
        }
    }

    void _writeString(const std::string& value) {
        if (findInvalidUTF8(value) != std::string::npos) {
            throw Unwritable{{}, "holds invalid UTF-8"};
        }
        text += '"';
        escapeJSON(value, [this](std::string_view piece) { text += piece; });
        text += '"';
    }

    void _writeReal(double value) {
        if (!std::isfinite(value)) {
            throw Unwritable{{}, "is no finite number, for which JSON has no place"};
        }
        const std::string real = formatReal(value);
        text += real;
        if (real.find_first_of(".e") == std::string::npos) {
            text += ".0"; // else it would read back as an integer
        }
    }
};

} // namespace

PropertyListReadResult readJSON(std::string_view bytes) {
    Builder builder(bytes);
    if (!Parser::sax_parse(bytes.begin(), bytes.end(), &builder)) {
        return {std::nullopt, builder.error};
    }
    return {std::move(builder.result), ""};
}

std::optional<std::string> writeJSON(const PropertyList& value, std::string* error) {
    Writer writer;
    try {
        writer.write(value);
        return std::move(writer.text);
    } catch (const Unwritable& unwritable) {
        if (error) {
            *error = (unwritable.path.empty() ? "the value" : unwritable.path) + " " + unwritable.why;
        }
        return std::nullopt;
    }
}

} // namespace welcomer::accountserver
