// One thing that was looked at on this machine, and what there is to say of it.

#pragma once

#include <string>
#include <vector>

namespace welcomer::tool {

enum class Verdict {
    Right,
    Wrong,   // is to be mended
    Unknown, // could not be looked at
};

// Every text is one line.
struct Finding {
    std::string subject; // such as "plug-ins"
    Verdict verdict;
    std::string text;
    std::string advice = {}; // what would mend it; may be empty
};
using Findings = std::vector<Finding>;

} // namespace welcomer::tool
