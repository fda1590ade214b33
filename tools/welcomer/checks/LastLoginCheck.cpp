#include "tools/welcomer/checks/LastLoginCheck.h"

#include "platform/CredentialStore.h"
#include "tools/welcomer/login/Advice.h"
#include "tools/welcomer/login/LastLogin.h"

#include <vector>

namespace welcomer::tool {

namespace {

constexpr char kSubject[] = "last login";

} // namespace

Finding checkLastLogin(const std::string& root) {
    const LastLogin last = lastLogin(queryOfCaller(root));
    if (!last.login) {
        return last.source.empty() ? Finding{kSubject, Verdict::Unknown,
                                             last.note.empty() ? "there is no log to read" : last.note}
                                   : Finding{kSubject, Verdict::Right, "the log has none with a setup"};
    }
    WaitingSetup none; // what waits now is another check's matter
    none.itemStatus = platform::kCredentialItemNotFound;
    const std::vector<ToDo> left = whatIsToDo(none, last.login, last.isRunning);
    if (left.empty()) {
        return {kSubject, Verdict::Right,
                last.isRunning ? "its agent is running" : "nothing is left to be done"};
    }
    return {kSubject, Verdict::Wrong,
            left.front().what +
                (left.size() == 1 ? "" : ", and " + std::to_string(left.size() - 1) + " more"),
            left.size() == 1 ? left.front().advice : "welcomer status shows each, with advice"};
}

} // namespace welcomer::tool
