// The text of a settings file: lines of the form `Name=value`.

#pragma once

#include <array>
#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::local {

// What can be set for all users of a machine.
enum class Setting : std::size_t {
    AccountServer,
    AccountServerAuthority,
    AccountServerConnectSeconds,
    AccountServerRevocations,
    AccountServerSeconds,
    OnlineAccountProvider,
    OnlineAccountServer,
    PluginFolder
};
inline constexpr std::size_t kSettingCount = 8;

// How a setting is called in a settings file. Any thread.
const char* nameOf(Setting setting);

// Longer files are not read.
inline constexpr std::size_t kMaximumSettingsSize = std::size_t{64} * 1024; // bytes

// So many problems of a file are told, and one more that says so.
inline constexpr std::size_t kMaximumSettingsProblems = 16;

struct SettingsText {
    std::array<std::optional<std::string>, kSettingCount> values; // by Setting; each makes sense
    std::vector<std::string> problems;                            // one line each, of ASCII alone
};

// Reads the text of a settings file. Blanks around a line, a name and a value count for nothing, nor do empty
// lines and those that begin with "#" or ";". Of several lines with the same name the last one that makes
// sense counts; what makes no sense is told and passed over, and costs no other line. Any thread.
SettingsText readSettings(std::string_view text);

} // namespace welcomer::local
