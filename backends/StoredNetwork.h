// The network at the machine's start. Only programs and tests include this.

#pragma once

#include <string>
#include <vector>

namespace welcomer {

// Has the machine use what is stored of its network, each enabled service for itself, and waits ten seconds for
// devices that are not there yet. What NetworkManager stores is not looked at: it sees to that itself.
//  root    the folder below which files are looked up
//  result  a line for each service that could not be used
// Any thread; needs the right to change the network; may block for half a minute.
std::vector<std::string> restoreStoredNetwork(const std::string& root = "/");

} // namespace welcomer
