// What somebody may have meant who mistyped a name.

#pragma once

#include <string>
#include <vector>

namespace welcomer::tool {

// The end of a sentence that asks whether the nearest of some names was meant: `; did you mean "show"?`; empty
// where none is near. Any thread.
std::string didYouMean(const std::string& typed, const std::vector<std::string>& names);

} // namespace welcomer::tool
