// What plug-ins may learn of the setup that they take part in.

#pragma once

#include <string>

namespace welcomer {

// Tells the plug-ins whose cloud account it is: its user name. Any thread; each plug-in gets what was set last before it
// asks.
void setPluginAccount(const std::string& account);

// Tells them the folder below which the platform looks up the system's files, "/" until then; with another one it is a
// trial. Any thread.
void setPluginRoot(const std::string& folder);

} // namespace welcomer
