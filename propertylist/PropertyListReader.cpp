#include "propertylist/PropertyListReader.h"

#include "propertylist/BinaryPropertyListReader.h"
#include "propertylist/TextPropertyListReader.h"
#include "propertylist/XMLPropertyListReader.h"

#include <algorithm>

namespace welcomer {

namespace {

// Both text formats may begin with "<": in the old-style one it begins data, of which hexadecimal digits and
// white space are all, up to a ">".
bool isMarkup(std::string_view text) {
    if (!text.starts_with('<')) {
        return false;
    }
    const std::size_t end = text.find_first_not_of("0123456789abcdefABCDEF \t\n\v\f\r", 1);
    return end != std::string_view::npos && text[end] != '>';
}

} // namespace

PropertyListReadResult readPropertyList(std::string_view bytes) {
    if (bytes.empty()) {
        return {std::nullopt, "byte 0: the data is empty"};
    }
    if (bytes.starts_with(kBinaryPropertyListMagic)) {
        return readBinaryPropertyList(bytes);
    }
    if (bytes.starts_with("\xFF\xFE") || bytes.starts_with("\xFE\xFF")) {
        return {std::nullopt, "byte 0: the encoding UTF-16 is not supported, only UTF-8 is"};
    }
    std::string_view text = bytes;
    if (text.starts_with("\xEF\xBB\xBF")) {
        text.remove_prefix(3);
    }
    text.remove_prefix(std::min(text.find_first_not_of(" \t\n\v\f\r"), text.size()));
    return isMarkup(text) ? readXMLPropertyList(bytes) : readTextPropertyList(bytes);
}

} // namespace welcomer
