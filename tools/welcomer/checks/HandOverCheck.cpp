#include "tools/welcomer/checks/HandOverCheck.h"

#include "platform/Platform.h"
#include "tools/welcomer/login/WaitingSetup.h"

namespace welcomer::tool {

namespace {

constexpr char kSubject[] = "next login";

Finding withItem(const WaitingSetup& waiting) {
    if (!waiting.hasAgent) {
        return {
            kSubject, Verdict::Wrong, "a replay item waits, and no agent will start for it",
            "install the agent with: welcomer replay arm; or drop the setup with: welcomer setup --cancel"};
    }
    if (!waiting.agentProblem.empty()) {
        return {kSubject, Verdict::Wrong,
                "a replay item waits, but the agent's file starts no agent: " + waiting.agentProblem,
                "install the agent anew with: welcomer replay arm"};
    }
    return {kSubject, Verdict::Right, "a replay item waits, and the agent will start for it"};
}

Finding withoutItem(const WaitingSetup& waiting) {
    if (!waiting.hasAgent) {
        return {kSubject, Verdict::Right, "nothing waits"};
    }
    return {kSubject, Verdict::Wrong, "the agent will start, and find no replay item",
            "remove it with: welcomer setup --cancel"};
}

} // namespace

Finding checkHandOver(const platform::BackendReport& credentials) {
    try {
        platform::current().processIdentity.homeDirectory();
    } catch (const platform::Exception& exception) {
        return {kSubject, Verdict::Unknown, exception.what()};
    }
    if (credentials.backend == "none") {
        return {kSubject, Verdict::Unknown,
                "whether a replay item waits cannot be told: " + credentials.reason};
    }
    if (credentials.startsWhenAsked) {
        return {kSubject, Verdict::Unknown,
                "whether a replay item waits cannot be told: the keyring does not run",
                "to start it and ask: welcomer status"};
    }
    const WaitingSetup waiting = findWaitingSetup();
    if (waiting.hasItem()) {
        return withItem(waiting);
    }
    if (waiting.itemStatus == platform::kCredentialItemNotFound) {
        return withoutItem(waiting);
    }
    return {kSubject, Verdict::Unknown,
            "whether a replay item waits cannot be told: " +
                platform::credentialStatusText(waiting.itemStatus)};
}

} // namespace welcomer::tool
