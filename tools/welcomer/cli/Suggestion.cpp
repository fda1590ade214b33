#include "tools/welcomer/cli/Suggestion.h"

#include <algorithm>
#include <cstddef>

namespace welcomer::tool {

namespace {

constexpr std::size_t kLongestName = 64;  // bytes; nobody mistypes longer ones
constexpr std::size_t kShortestStart = 3; // bytes of a name that stand for all of it

// How many characters were left out, put in, replaced, or swapped with their neighbours.
std::size_t distance(const std::string& from, const std::string& to) {
    std::vector<std::vector<std::size_t>> steps(from.size() + 1, std::vector<std::size_t>(to.size() + 1));
    for (std::size_t i = 0; i <= from.size(); ++i) {
        for (std::size_t j = 0; j <= to.size(); ++j) {
            if (i == 0 || j == 0) {
                steps[i][j] = i + j;
                continue;
            }
            const std::size_t replaced = steps[i - 1][j - 1] + (from[i - 1] == to[j - 1] ? 0 : 1);
            steps[i][j] = std::min({steps[i - 1][j] + 1, steps[i][j - 1] + 1, replaced});
            if (i > 1 && j > 1 && from[i - 1] == to[j - 2] && from[i - 2] == to[j - 1]) {
                steps[i][j] = std::min(steps[i][j], steps[i - 2][j - 2] + 1);
            }
        }
    }
    return steps[from.size()][to.size()];
}

} // namespace

std::string didYouMean(const std::string& typed, const std::vector<std::string>& names) {
    if (typed.size() > kLongestName) {
        return "";
    }
    const std::string* nearest = nullptr;
    std::size_t least = std::max<std::size_t>(typed.size() / 3, 1) + 1;
    for (const std::string& name : names) {
        const bool isStart = typed.size() >= kShortestStart && name.starts_with(typed);
        const std::size_t steps = isStart ? 1 : distance(typed, name);
        if (steps < std::min(least, name.size())) {
            least = steps;
            nearest = &name;
        }
    }
    return nearest ? "; did you mean \"" + *nearest + "\"?" : "";
}

} // namespace welcomer::tool
