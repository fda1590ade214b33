#include "tools/launch-agents/offerAgain.h"

#include "handoff/LaunchAgentFile.h"
#include "platform/CredentialStore.h"
#include "propertylist/PropertyListReader.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>
#include <set>
#include <sys/stat.h>

namespace welcomer::launch {
namespace {

using Lines = std::vector<std::string>;

Lines unasked(const std::string& status) {
    return {"Self destructing...", "Failed to find replay keychain item: " + status, "exiting"};
}

TEST(StatusOfUnaskedItem, IsThatOfEveryReasonNotToHaveAsked) {
    std::set<std::int32_t> offered;
    for (std::int32_t status = -1; status < 40; ++status) {
        if (const auto found = statusOfUnaskedItem(unasked(std::to_string(status)))) {
            EXPECT_EQ(*found, status);
            offered.insert(status);
        }
    }
    EXPECT_EQ(offered,
              (std::set<std::int32_t>{platform::kCredentialLocked, platform::kCredentialDismissed,
                                      platform::kCredentialPromptUnanswered, platform::kCredentialNoService,
                                      platform::kCredentialNoBus, platform::kCredentialFindTimedOut,
                                      platform::kCredentialStartFailed, platform::kCredentialBusDied}));
}

TEST(StatusOfUnaskedItem, TakesTheAgentsLastTwoLines) {
    EXPECT_TRUE(
        statusOfUnaskedItem({"Self destructing...", "Failed to remove wlnimbussetup plist for anna: x",
                             "Failed to find replay keychain item: 8", "exiting"}));
    EXPECT_FALSE(statusOfUnaskedItem({}));
    EXPECT_FALSE(statusOfUnaskedItem({"exiting"}));
    EXPECT_FALSE(statusOfUnaskedItem({"Self destructing...", "Failed to find replay keychain item: 8"}));
    EXPECT_FALSE(statusOfUnaskedItem({"Failed to find replay keychain item: 8", "Killing onlineaccounts",
                                      "delaying exit by two minutes", "exiting"}));
    EXPECT_FALSE(statusOfUnaskedItem({"Failed to find replay keychain item: 8", "exiting", "and so on"}));
}

TEST(StatusOfUnaskedItem, NeedsTheWholeLine) {
    for (const char* const status : {"", "8 ", "8x", "0x8", " 8", "8\n", "99999999999999999999"}) {
        EXPECT_FALSE(statusOfUnaskedItem(unasked(status))) << status;
    }
    EXPECT_FALSE(statusOfUnaskedItem({"x Failed to find replay keychain item: 8", "exiting"}));
}

class PutBack : public testing::Test {
  protected:
    PutBack() { _root.addDirectory("/agents"); }

    static LaunchAgent agent(const std::string& rest = "") {
        LaunchAgent agent;
        agent.label = kLaunchAgentLabel;
        agent.file = launchAgentFileName(kLaunchAgentLabel);
        agent.content = "<plist><dict><key>Label</key><string>" + agent.label +
                        "</string><key>Program</key><string>/bin/agent</string><key>RunAtLoad</key><true/>" +
                        rest + "</dict></plist>";
        return agent;
    }
    std::string file() const { return "/agents/" + launchAgentFileName(kLaunchAgentLabel); }

    void putBackAfterLock(const LaunchAgent& agent) {
        putBack(_root.locate("/agents"), agent, platform::kCredentialLocked);
    }
    Lines log() const { return _fake.systemLog.lines(); }

    TemporaryRoot _root;
    fakes::FakePlatform _fake;
    const platform::ScopedPlatform _installed{_fake.platform()};
};

TEST_F(PutBack, TheDefinitionIsThereAgainAndCountsUntilItWasOfferedThreeTimes) {
    LaunchAgent next = agent();
    for (int offer = 1; offer <= kMostOffers; ++offer) {
        putBackAfterLock(next);
        const auto content = _root.content(file());
        ASSERT_TRUE(content) << offer;
        const PropertyListReadResult read = readPropertyList(*content);
        ASSERT_TRUE(read);
        const PropertyList expected = PropertyList::Dictionary{{"Label", std::string(kLaunchAgentLabel)},
                                                               {"Program", "/bin/agent"},
                                                               {"RunAtLoad", true},
                                                               {kOffersKey, std::int64_t{offer}}};
        EXPECT_EQ(*read.value, expected);
        EXPECT_EQ(log().size(), static_cast<std::size_t>(offer));
        EXPECT_EQ(log().back(),
                  "Launch agent com.corvid.welcomer.nimbussetup.user is offered again at the next login (" +
                      std::to_string(offer) +
                      " of 3): the keyring is locked, and nobody can be asked to unlock it");
        next.content = *content;
        ASSERT_EQ(std::remove(_root.locate(file()).c_str()), 0);
    }
    putBackAfterLock(next);
    EXPECT_EQ(_root.names("/agents"), Lines());
    EXPECT_EQ(log().size(), 4U);
    EXPECT_EQ(log().back(), "Launch agent com.corvid.welcomer.nimbussetup.user is not offered once more: the "
                            "keyring is locked, and nobody can be asked to unlock it");
}

TEST_F(PutBack, TheFileIsItsOwnersToWriteWhateverTheMask) {
    const mode_t before = ::umask(0002);
    putBackAfterLock(agent());
    ::umask(before);
    struct stat status {};
    ASSERT_EQ(::stat(_root.locate(file()).c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, 0644U);
    EXPECT_EQ(_root.names("/agents").size(), 1U);
}

TEST_F(PutBack, ACountThatIsNoneCountsAsNoOffer) {
    for (const char* const count : {"<string>9</string>", "<integer>-7</integer>", "<true/>"}) {
        putBackAfterLock(agent(std::string("<key>OfferedAgain</key>") + count));
        EXPECT_NE(log().back().find("(1 of 3)"), std::string::npos) << count;
        ASSERT_EQ(std::remove(_root.locate(file()).c_str()), 0);
    }
}

TEST_F(PutBack, AFileThatIsThereAlreadyStays) {
    _root.addFile(file(), "another setup's");
    putBackAfterLock(agent());
    EXPECT_EQ(_root.content(file()), "another setup's");
    EXPECT_EQ(_root.names("/agents").size(), 1U);
    EXPECT_EQ(log(), Lines());
}

TEST_F(PutBack, AFolderThatIsGoneCostsOneLine) {
    std::filesystem::remove(_root.locate("/agents"));
    putBackAfterLock(agent());
    EXPECT_EQ(log(), Lines{"Failed to offer launch agent com.corvid.welcomer.nimbussetup.user again: No such "
                           "file or directory"});
}

// Says that an agent has ended, or that it cannot tell.
class Starter final : public AgentStarter {
  public:
    explicit Starter(std::vector<std::string>& asked) : _asked(asked) {}
    platform::Outcome start(const LaunchAgent& /*agent*/) override { return platform::Outcome::success(); }
    std::optional<AgentRun> waitForEnd(const LaunchAgent& agent) override {
        _asked.push_back(agent.label);
        return std::nullopt;
    }

  private:
    std::vector<std::string>& _asked;
};

TEST_F(PutBack, OnlyTheAgentOfThisSystemIsWaitedForAndNothingIsDoneWithoutItsLines) {
    std::vector<std::string> asked;
    LaunchAgent foreign = agent();
    foreign.label = "org.example.other";
    LaunchAgent elsewhere = agent();
    elsewhere.file = "another.plist";
    offerAgain(_root.locate("/agents"), {std::make_unique<Starter>(asked), {foreign, elsewhere}});
    EXPECT_EQ(asked, Lines());
    offerAgain(_root.locate("/agents"), {nullptr, {}});
    offerAgain(_root.locate("/agents"), {std::make_unique<Starter>(asked), {foreign, agent()}});
    EXPECT_EQ(asked, Lines{kLaunchAgentLabel});
    EXPECT_EQ(_root.names("/agents"), Lines());
    EXPECT_EQ(log(), Lines());
}

} // namespace
} // namespace welcomer::launch
