// In the place of the journal's reader where the library that reads it is not there.

#include "tools/welcomer/login/LoginLog.h"

namespace welcomer::tool {

SourceLines readJournal(const LoginQuery& /*query*/) {
    return {.name = "journal"};
}

} // namespace welcomer::tool
