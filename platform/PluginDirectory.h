// Where the delegate plug-ins are.

#pragma once

namespace welcomer::platform {

// The directory that the system names. A backend whose machine does not have it serves another one in its place.
inline constexpr char kPluginDirectory[] = "/System/Library/CoreServices/FirstRunPlugins";

} // namespace welcomer::platform
