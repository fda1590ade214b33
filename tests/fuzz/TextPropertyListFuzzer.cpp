#include "propertylist/TextPropertyListReader.h"
#include "tests/fuzz/Require.h"

#include <cstddef>
#include <cstdint>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    welcomer::requireWellFormed(welcomer::readTextPropertyList({reinterpret_cast<const char*>(bytes), size}));
    return 0;
}
