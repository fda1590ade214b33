// What stands in the way of a setup, and what can be done about it.

#pragma once

#include "tools/welcomer/login/LoginLines.h"
#include "tools/welcomer/login/LoginRecord.h"
#include "tools/welcomer/login/WaitingSetup.h"

#include <optional>
#include <string>
#include <vector>

namespace welcomer::tool {

// One thing that is not as it should be. Both are one line.
struct ToDo {
    std::string what;
    std::string advice;
};

// What is to be done before the next login, or after the last one. What the last login left undone does not
// count any more where another setup waits.
//  login      the last one, or none
//  isRunning  whether its agent still runs
//  user       whom root asks for, or empty: the commands that are advised are then for that user
std::vector<ToDo> whatIsToDo(const WaitingSetup& waiting, const std::optional<Login>& login, bool isRunning,
                             const std::string& user = "");

} // namespace welcomer::tool
