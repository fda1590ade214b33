#include "backends/local/SettingsText.h"
#include "tests/fuzz/Require.h"

#include <cstddef>
#include <cstdint>
#include <string>

using namespace welcomer;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    const local::SettingsText read = local::readSettings({reinterpret_cast<const char*>(bytes), size});
    require(read.problems.size() <= local::kMaximumSettingsProblems + 1, "no more problems than can be read");
    for (const std::string& problem : read.problems) {
        for (const char character : problem) {
            require(character >= 0x20 && character <= 0x7E, "a problem is one printable line");
        }
    }
    // What was accepted is accepted again, as it stands.
    std::string text;
    for (std::size_t i = 0; i < local::kSettingCount; ++i) {
        if (read.values[i]) {
            text.append(local::nameOf(static_cast<local::Setting>(i)))
                .append("=")
                .append(*read.values[i])
                .append("\n");
        }
    }
    const local::SettingsText again = local::readSettings(text);
    require(again.problems.empty() && again.values == read.values, "accepted values stay what they are");
    return 0;
}
