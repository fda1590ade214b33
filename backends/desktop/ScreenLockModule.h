// The desktop's setting of the screen lock, as a module.

#pragma once

#include <optional>

namespace welcomer::desktop {

class ScreenLock {
  public:
    virtual ~ScreenLock() = default;

    // Whether the screen asks for the password once it is locked: "lock-enabled" of
    // org.gnome.desktop.screensaver.
    //  result  none where that schema is not installed
    // Any thread; never throws.
    virtual std::optional<bool> asksForPassword() = 0;
};

struct ScreenLockModule {
    static constexpr char kName[] = "screenlock";
    using Interface = ScreenLock;
    struct Arguments {};
};

} // namespace welcomer::desktop
