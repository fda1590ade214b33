// A window of the hosting application.

#pragma once

namespace welcomer::platform {

// Opaque: the system passes a window on to the account service and never looks into it. A host derives from
// it what its account service understands.
class Window {
  public:
    virtual ~Window() = default;
};

} // namespace welcomer::platform
