// What is known of a user's last login.

#pragma once

#include "tools/welcomer/login/LoginLines.h"
#include "tools/welcomer/login/LoginLog.h"

#include <optional>
#include <string>

namespace welcomer::tool {

struct LastLogin {
    std::string source; // as of FoundLogins
    std::string note;   // likewise
    std::optional<Login> login = {};
    bool isRunning = false; // its agent
};

// Reads the log, from its end.
LastLogin lastLogin(const LoginQuery& query);

// Asks for the last login of the installed platform's user.
//  root  below which the logs are looked up
LoginQuery queryOfCaller(const std::string& root);

} // namespace welcomer::tool
