// What the client library says of its objects, in the language's own terms.

#pragma once

#include <NetworkManager.h>
#include <string>
#include <vector>

namespace welcomer::desktop {

// A text of the library; empty where it has none.
inline std::string orEmpty(const char* text) {
    return text ? text : "";
}

// The elements of one of the library's lists, borrowed; none for a null list.
template <class T>
std::vector<T*> elements(const GPtrArray* list) {
    std::vector<T*> found;
    for (guint index = 0; list && index < list->len; ++index) {
        found.push_back(static_cast<T*>(g_ptr_array_index(list, index)));
    }
    return found;
}

// Whether a device is on its way to using a profile, or uses it.
inline bool isRunning(NMDevice* device) {
    const NMDeviceState state = nm_device_get_state(device);
    return state >= NM_DEVICE_STATE_PREPARE && state <= NM_DEVICE_STATE_ACTIVATED;
}

// The UUID of the profile that a device runs; empty when there is none. The device may be null.
inline std::string runningProfile(NMDevice* device) {
    NMActiveConnection* const active =
        device && isRunning(device) ? nm_device_get_active_connection(device) : nullptr;
    return active ? orEmpty(nm_active_connection_get_uuid(active)) : "";
}

} // namespace welcomer::desktop
