// Whatever is read and can be written must read back to the same value.

#include "propertylist/PropertyListReader.h"
#include "propertylist/PropertyListWriter.h"
#include "propertylist/UnwritableValue.h"
#include "propertylist/XMLPropertyListReader.h"
#include "tests/fuzz/Require.h"

#include <cstddef>
#include <cstdint>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    using namespace welcomer;
    const std::string_view input(reinterpret_cast<const char*>(bytes), size);
    const PropertyListReadResult first = readPropertyList(input);
    requireWellFormed(first);
    if (!first) {
        return 0;
    }
    std::string error;
    const std::optional<std::string> written = writeXMLPropertyList(*first.value, &error);
    require(findUnwritableValue(*first.value).has_value() == !written,
            "what cannot be written is found beforehand");
    if (!written) {
        require(!error.empty(), "no result has a reason");
        require(!readXMLPropertyList(input), "what the XML format holds can be written");
        return 0;
    }
    const PropertyListReadResult second = readPropertyList(*written);
    require(second.value.has_value(), "what was written can be read");
    // Texts are compared because one and the same not-a-number is unequal to itself, and because the first
    // writing cuts dates to whole seconds. Equal values have equal texts, unequal ones different texts.
    require(writeXMLPropertyList(*second.value) == written, "what was written reads back to the same value");
    return 0;
}
