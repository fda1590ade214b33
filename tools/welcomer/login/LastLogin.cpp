#include "tools/welcomer/login/LastLogin.h"

#include "platform/Platform.h"
#include "tools/welcomer/login/LoginRecord.h"
#include "tools/welcomer/login/LoginReport.h"
#include "tools/welcomer/login/RunningAgent.h"

#include <utility>

namespace welcomer::tool {

LastLogin lastLogin(const LoginQuery& query) {
    FoundLogins found = findLogins(query);
    LastLogin last{std::move(found.source), std::move(found.note)};
    if (!found.logins.empty()) {
        last.login = std::move(found.logins.back());
        last.isRunning = last.login->hasAgent && record(*last.login).end() == LoginRecord::End::Unfinished &&
                         agentRuns(query.root, query.userID);
    }
    return last;
}

LoginQuery queryOfCaller(const std::string& root) {
    platform::ProcessIdentity& identity = platform::current().processIdentity;
    return {.root = root, .userID = identity.effectiveUserID(), .userName = identity.loginName()};
}

} // namespace welcomer::tool
