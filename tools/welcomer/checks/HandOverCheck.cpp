#include "tools/welcomer/checks/HandOverCheck.h"

#include "handoff/LaunchAgentFile.h"
#include "handoff/ReplayItem.h"
#include "platform/Platform.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListReader.h"

#include <optional>

namespace welcomer::tool {

namespace {

constexpr char kSubject[] = "next login";

// Why the launch agent could not start the agent; empty when it could.
std::string troubleOf(const std::string& launchAgent) {
    platform::FileSystem& files = platform::current().fileSystem;
    const auto text = files.readText(launchAgent);
    const auto read = readPropertyList(text.value_or(""));
    const auto arguments = read.value ? textsIn(*read.value, "ProgramArguments") : std::nullopt;
    if (!arguments || arguments->empty()) {
        return launchAgent + " does not say what to start";
    }
    return files.exists(arguments->front()) ? "" : "there is no program " + arguments->front();
}

Finding withItem(const std::string& launchAgent) {
    if (!platform::current().fileSystem.exists(launchAgent)) {
        return {
            kSubject, Verdict::Wrong, "a replay item waits, and no agent will start for it",
            "install the agent with: welcomer replay arm; or drop the setup with: welcomer setup --cancel"};
    }
    const std::string trouble = troubleOf(launchAgent);
    if (!trouble.empty()) {
        return {kSubject, Verdict::Wrong, "a replay item waits, but " + trouble,
                "install the agent anew with: welcomer replay arm"};
    }
    return {kSubject, Verdict::Right, "a replay item waits, and the agent will start for it"};
}

Finding withoutItem(const std::string& launchAgent) {
    if (!platform::current().fileSystem.exists(launchAgent)) {
        return {kSubject, Verdict::Right, "nothing waits"};
    }
    return {kSubject, Verdict::Wrong, "the agent will start, and find no replay item",
            "remove it with: welcomer setup --cancel"};
}

} // namespace

Finding checkHandOver() {
    const platform::Platform& platform = platform::current();
    std::string home;
    try {
        home = platform.processIdentity.homeDirectory();
    } catch (const platform::Exception& exception) {
        return {kSubject, Verdict::Unknown, exception.what()};
    }
    const std::int32_t status =
        platform.credentialStore
            .findItem(kReplayItemService, kReplayItemAccount, platform::CredentialWish::Presence)
            .status;
    const std::string launchAgent = launchAgentPath(home);
    if (status == platform::kCredentialSuccess) {
        return withItem(launchAgent);
    }
    if (status == platform::kCredentialItemNotFound) {
        return withoutItem(launchAgent);
    }
    return {kSubject, Verdict::Unknown,
            "whether a replay item waits cannot be told: " + platform::credentialStatusText(status)};
}

} // namespace welcomer::tool
