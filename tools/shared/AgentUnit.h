// The unit that a launch agent runs as, where a user manager runs it.

#pragma once

#include "propertylist/Characters.h"

#include <string>
#include <string_view>

namespace welcomer::launch {

// The name of the unit that an agent with this label runs as: "welcomer-agent-LABEL.service", with what a
// unit's name cannot hold written as "\xNN".
inline std::string unitName(std::string_view label) {
    std::string name = "welcomer-agent-";
    for (const char character : label) {
        if (isLetterOrDigit(character) ||
            std::string_view("._-:").find(character) != std::string_view::npos) {
            name += character;
        } else {
            name += "\\x";
            appendHex(name, static_cast<unsigned char>(character));
        }
    }
    return name + ".service";
}

} // namespace welcomer::launch
