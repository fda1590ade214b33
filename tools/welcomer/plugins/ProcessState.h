// What a process has that a plug-in shares with everybody else in it.

#pragma once

#include <cstdint>
#include <map>
#include <string>

namespace welcomer::tool {

struct OpenDescriptor {
    std::string target;       // the device and number of what it leads to
    bool isInherited = false; // by programs that are started
    bool operator==(const OpenDescriptor&) const = default;
};

std::string currentFolder();
std::string currentLocale();
std::string currentFileModeMask(); // in octal

// The handlers by the signals' names: "default", "ignored", or which function.
std::map<std::string, std::string> currentSignalHandlers();

std::map<int, OpenDescriptor> currentDescriptors();

} // namespace welcomer::tool
