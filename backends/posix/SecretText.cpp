#include "backends/posix/SecretText.h"

#include <cstddef>
#include <cstring>
#include <mutex>
#include <sys/prctl.h>

namespace welcomer::posix {

namespace {

struct Held {
    std::mutex mutex;
    std::size_t count = 0;
    int dumpableBefore = 0;
};

// Never destroyed: a thread may hold one while the process ends.
Held& held() {
    static Held& instance = *new Held;
    return instance;
}

} // namespace

void wipe(std::string& text) {
    text.resize(text.capacity()); // beyond the size, an earlier and longer content may be left
    ::explicit_bzero(text.data(), text.size());
    text.clear();
}

SecretText::SecretText(std::string_view text) {
    Held& all = held();
    {
        const std::lock_guard lock(all.mutex);
        if (all.count++ == 0) {
            all.dumpableBefore = ::prctl(PR_GET_DUMPABLE);
            ::prctl(PR_SET_DUMPABLE, 0);
        }
    }
    _text = text;
}

SecretText::~SecretText() {
    wipe(_text);
    Held& all = held();
    const std::lock_guard lock(all.mutex);
    // Anything but 1 is the system's own choice, and cannot be set.
    if (--all.count == 0 && all.dumpableBefore == 1) {
        ::prctl(PR_SET_DUMPABLE, 1);
    }
}

} // namespace welcomer::posix
