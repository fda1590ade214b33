// Property lists as plug-ins see them: opaque handles, with the functions that read and build them.

#pragma once

#include "propertylist/PropertyList.h"
#include "sdk/welcomer/delegate_plugin.h"

#include <optional>
#include <string>

namespace welcomer {

// What the host offers plug-ins. Lives until the process ends. Any thread.
const wl_host& delegatePluginHost();

// A value as a borrowed handle, which lives as long as the value, unchanged. Any thread.
const wl_value* borrowedHandle(const PropertyList& value);

// Takes over a handle that a plug-in owned, and the value behind it; none for null. Any thread.
std::optional<PropertyList> takeHandle(wl_value* handle);

// Where one call into a plug-in finds out whether the plug-in raised.
class ErrorSlot {
  public:
    // The form that crosses. Borrowed.
    wl_error_slot* handle() { return reinterpret_cast<wl_error_slot*>(this); }

    bool raised() const { return _raised; }
    const std::string& message() const { return _message; }

    // Raises; only the first message stays. The message may be null, and need not be UTF-8.
    void raise(const char* message) noexcept;

  private:
    bool _raised = false;
    std::string _message;
};

} // namespace welcomer
