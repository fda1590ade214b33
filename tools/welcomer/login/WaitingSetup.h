// What waits for the user's next login: the replay item, and the file that has the agent start.

#pragma once

#include <cstdint>
#include <string>

namespace welcomer::tool {

struct WaitingSetup {
    std::int32_t itemStatus =
        0;               // of platform::CredentialStatus: whether there is an item, or why nobody knows
    std::string store;   // where the item lies; empty where that was not told
    std::string account; // the cloud account that it is for; likewise

    std::string agentPath;    // where the agent's file belongs
    bool hasAgent = false;    // whether it is there
    std::string agentProblem; // why it starts no agent, of one that is there; else empty

    bool hasItem() const;

    // Whether there are both or neither, and the file starts the agent.
    bool fits() const;
};

// Looks at the installed platform's user. Asks nobody to unlock anything, but may block while a keyring answers.
WaitingSetup findWaitingSetup();

} // namespace welcomer::tool
