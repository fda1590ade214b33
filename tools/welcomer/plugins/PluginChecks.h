// Which checks there are for plug-ins: the one table of them.

#pragma once

#include "tools/welcomer/plugins/Checks.h"

#include <span>
#include <string_view>

namespace welcomer::tool {

// What a finding of a check means.
enum class Severity {
    Failure, // the plug-in breaks a rule
    Warning, // it would be better otherwise
};

// Which ends of its process, before it was through, are a finding of the check.
enum class EndsThatCount {
    All,             // by a signal, by exit, or because it took too long
    Exit,            // those by exit alone
    SanitizerReport, // those with a report of the address sanitizer
    None,
};

struct PluginCheck {
    std::string_view name;
    std::string_view description; // one line
    std::string_view documented;  // the header or page, a colon, and what to look for there
    std::string_view needs;       // the check without which it is not made; empty for none
    Severity severity = Severity::Failure;
    EndsThatCount ends = EndsThatCount::All;
    checks::Check* run = nullptr;
};

// In the order in which they are made. Lives until the process ends.
std::span<const PluginCheck> pluginChecks();

} // namespace welcomer::tool
