// What a setup has left for the next login, and mending it.

#pragma once

#include "platform/ResourceBundle.h"
#include "tools/welcomer/cli/KeptLog.h"
#include "tools/welcomer/login/WaitingSetup.h"

#include <string>

namespace welcomer::tool {

// For whom a hand-over is looked at, as far as the advice to people depends on it.
struct Caller {
    std::string user;           // whom `--user` names; empty: the caller
    bool storesLocally = false; // what the keyring does not tell is no obstacle then
};

// Refuses to begin a setup where a hand-over, or half of one, is waiting already, or where that cannot be
// told: with CommandFailure, which says how that is mended.
void refuseWhereSomethingIsWaiting(const Caller& caller);

// Installs the agent for an item that waits, unless it is there; a file that starts no agent makes way. Throws
// CommandFailure where no item waits, where that cannot be told, and with the reason where the agent cannot be
// installed.
//  log     where that reason is read
//  result  whether it had to be installed
bool armAgent(const KeptLog& log, platform::ResourceBundle& bundle);

// Takes a hand-over back: removes the item, and then the agent's file. Throws CommandFailure where there is
// neither; where the item cannot be removed the file stays, too.
//  log     where the reason is read
//  result  what there was
WaitingSetup cancelHandOver(const KeptLog& log);

} // namespace welcomer::tool
