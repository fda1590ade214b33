#include "tools/welcomer/login/Advice.h"

#include "platform/CredentialStore.h"

#include <gtest/gtest.h>

namespace welcomer::tool {
namespace {

using namespace std::chrono_literals;
using Texts = std::vector<std::string>;

WaitingSetup waiting(bool item, bool agent, const std::string& problem = "") {
    WaitingSetup found;
    found.itemStatus = item ? platform::kCredentialSuccess : platform::kCredentialItemNotFound;
    found.hasAgent = agent;
    found.agentProblem = problem;
    return found;
}

Login loginOf(std::initializer_list<const char*> lines) {
    Login login{.lines = {}, .hasAgent = true};
    for (const char* line : lines) {
        login.lines.push_back({.program = "wlnimbussetup", .message = line});
    }
    return login;
}

// What is to be done; each has its advice.
Texts whats(const WaitingSetup& setup, const std::optional<Login>& login = std::nullopt,
            bool isRunning = false) {
    Texts texts;
    for (const ToDo& each : whatIsToDo(setup, login, isRunning)) {
        EXPECT_NE(each.advice, "");
        EXPECT_EQ(each.what.find('\n'), std::string::npos);
        texts.push_back(each.what);
    }
    return texts;
}

TEST(Advice, NothingIsToBeDoneWhereBothOrNeitherWait) {
    EXPECT_EQ(whats(waiting(false, false)), Texts{});
    EXPECT_EQ(whats(waiting(true, true)), Texts{});
}

TEST(Advice, AnItemWithoutAnAgentSaysWhyItIsStillThere) {
    EXPECT_EQ(whats(waiting(true, false)), Texts{"an item waits, but no agent will start for it"});
    EXPECT_EQ(
        whats(waiting(true, false),
              loginOf({"Self destructing...", "Failed to find replay keychain item: 8", "exiting"})),
        Texts{"an item waits, but no agent will start for it (at the last login: the keyring is locked, and "
              "nobody can be asked to unlock it)"});
}

TEST(Advice, AnAgentWithoutAnItemOrThatCannotStart) {
    EXPECT_EQ(whats(waiting(false, true)), Texts{"the agent will start, but there is no item for it"});
    EXPECT_EQ(whats(waiting(true, true, "it cannot be read")),
              Texts{"the agent's file starts no agent: it cannot be read"});
}

TEST(Advice, WhoAsksForAnotherUserIsToldTheCommandsForThatUser) {
    const auto advices = [](const WaitingSetup& setup, const std::optional<Login>& login) {
        Texts texts;
        for (const ToDo& each : whatIsToDo(setup, login, false, "anna")) {
            texts.push_back(each.advice);
        }
        return texts;
    };
    const std::string both =
        "welcomer replay arm --user anna installs the agent; welcomer setup --cancel --user anna gives the "
        "setup up";
    EXPECT_EQ(advices(waiting(true, false), std::nullopt), Texts{both});
    EXPECT_EQ(advices(waiting(true, true, "it cannot be read"), std::nullopt), Texts{both});
    EXPECT_EQ(advices(waiting(false, true, "it cannot be read"), std::nullopt),
              Texts{"welcomer setup --cancel --user anna removes it"});
    EXPECT_EQ(advices(waiting(false, true), std::nullopt),
              Texts{"welcomer setup --cancel --user anna removes the agent's file"});

    const auto advice = [&](const char* failure) {
        const Texts texts =
            advices(waiting(false, false), loginOf({"Self destructing...", failure, "exiting"}));
        return texts.size() == 1 ? texts.front() : testing::PrintToString(texts);
    };
    EXPECT_EQ(advice("Nimbus service 'x' cannot be enabled on this machine for this user."),
              "welcomer account services --user anna shows whether it can be enabled by now, welcomer "
              "services enable --user anna --phase post enables it");
    EXPECT_EQ(advice("Failed to deserialize replayable data length: 3"),
              "welcomer setup --cancel --user anna removes the item; then set up again");
    EXPECT_EQ(advice("Failed to delete replay keychain item: 8"),
              "welcomer replay show --user anna says whether it is still there, welcomer replay delete "
              "--user anna removes it");
    EXPECT_EQ(advice("Failed to retrieve SK_Account"),
              "welcomer account list --user anna shows the accounts; sign in, then welcomer services enable "
              "--user anna");
    EXPECT_EQ(advice("exception in wlnimbussetup: boom"),
              "welcomer log --user anna shows what came before it");
}

TEST(Advice, AKeyringThatCannotBeAsked) {
    WaitingSetup setup = waiting(false, false);
    setup.itemStatus = platform::kCredentialNoBus;
    EXPECT_EQ(whats(setup),
              Texts{"whether an item waits cannot be told: the keyring could not be asked: there is no "
                    "session bus"});
}

TEST(Advice, WhatTheLastLoginLeftUndone) {
    const Login login = loginOf({"Self destructing...", "Exception killing onlineaccounts: gone",
                                 "Nimbus service 'x' cannot be enabled on this machine for this user.",
                                 "Enabling 'y' after a 3.00 second delay", "no cached response for c",
                                 "setting up a", "setting up b", "a setup: no room (1.000 seconds)"});
    EXPECT_EQ(whats(waiting(false, false), login),
              (Texts{"a refused: no room", "b never answered",
                     "x: Nimbus service 'x' cannot be enabled on this machine for this user.",
                     "y: put off, and not enabled", "Exception killing onlineaccounts: gone",
                     "the agent of the last login was ended before it was done"}));
}

TEST(Advice, WhatMayStillComeIsNothingToBeDone) {
    const Login login =
        loginOf({"Self destructing...", "Enabling 'y' after a 3.00 second delay", "setting up a"});
    EXPECT_EQ(whats(waiting(false, false), login, true), Texts{});
}

TEST(Advice, AWholeLoginLeavesNothing) {
    const Login login = loginOf({"Self destructing...", "setting up a", "a setup: completed (1.000 seconds)",
                                 "delaying exit by two minutes", "exiting"});
    EXPECT_EQ(whats(waiting(false, false), login), Texts{});
}

TEST(Advice, AnAgentsFileThatIsGoneIsNothingToBeDone) {
    const Login login =
        loginOf({"Self destructing...", "Failed to remove wlnimbussetup plist for anna: no such file",
                 "Failed to find replay keychain item: 2", "exiting"});
    EXPECT_EQ(whats(waiting(false, false), login), Texts{});
    EXPECT_EQ(whats(waiting(false, true), login).back(),
              "Failed to remove wlnimbussetup plist for anna: no such file");
}

TEST(Advice, AnotherSetupThatWaitsMakesUpForTheLastLogin) {
    const Login login =
        loginOf({"Self destructing...", "setting up a", "a setup: no (1.000 seconds)", "exiting"});
    EXPECT_EQ(whats(waiting(true, true), login), Texts{});
}

TEST(Advice, APlugInThatEndedTheAgent) {
    const Login login = loginOf({"Self destructing...", "ended by plug-in a.ncdplugin: SIGSEGV"});
    EXPECT_EQ(whats(waiting(false, false), login),
              Texts{"the agent was ended by plug-in a.ncdplugin: SIGSEGV"});
}

TEST(Advice, ALoginAtWhichNoAgentStarted) {
    Login login;
    login.lines.push_back(
        {.program = "welcomer-launch-agents", .message = "Refusing launch agent a: it is no dictionary"});
    EXPECT_EQ(whats(waiting(false, false), login),
              Texts{"at the last login: Refusing launch agent a: it is no dictionary"});
}

} // namespace
} // namespace welcomer::tool
