#include "tools/welcomer/terminal/UTF8Characters.h"

namespace welcomer::tool {

namespace {

// Made when it is first wanted, and kept.
locale_t utf8() {
    static const locale_t made = newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr);
    return made;
}

} // namespace

UTF8Characters::UTF8Characters() : _before(uselocale(utf8())) {}

UTF8Characters::~UTF8Characters() {
    uselocale(_before);
}

} // namespace welcomer::tool
