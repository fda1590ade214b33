// Characters as the tool has them, whatever the environment says.

#pragma once

#include <locale.h> // NOLINT(modernize-deprecated-headers): locale_t is POSIX's

namespace welcomer::tool {

// While it lives, the C library takes this thread's characters for UTF-8; on a machine without the locale
// "C.UTF-8" they stay what they were.
class UTF8Characters {
  public:
    UTF8Characters();
    ~UTF8Characters();
    UTF8Characters(const UTF8Characters&) = delete;
    UTF8Characters& operator=(const UTF8Characters&) = delete;

  private:
    const locale_t _before;
};

} // namespace welcomer::tool
