#include "propertylist/PropertyListReader.h"

#include "propertylist/XMLPropertyListReader.h"

namespace welcomer {

PropertyListReadResult readPropertyList(std::string_view bytes) {
    if (bytes.empty()) {
        return {std::nullopt, "byte 0: the data is empty"};
    }
    return readXMLPropertyList(bytes);
}

} // namespace welcomer
