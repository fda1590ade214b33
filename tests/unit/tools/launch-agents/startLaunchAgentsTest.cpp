#include "tools/launch-agents/startLaunchAgents.h"

#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::launch {
namespace {

class StartLaunchAgents : public testing::Test {
  protected:
    StartLaunchAgents() {
        _root.addDirectory("/agents");
        _root.addDirectory("/run");
        EXPECT_EQ(::chmod(_root.locate("/agents").c_str(), 0755), 0);
    }

    void add(const std::string& label, const std::string& rest = "<key>RunAtLoad</key><true/>") {
        const std::string name = "/agents/" + label + ".plist";
        _root.addFile(name, "<plist><dict><key>Label</key><string>" + label +
                                "</string><key>Program</key><string>/bin/true</string>" + rest +
                                "</dict></plist>");
        EXPECT_EQ(::chmod(_root.locate(name).c_str(), 0644), 0);
    }

    StartedAgents logIn(const std::string& runtimeFolder = "/run") {
        return startLaunchAgents(_root.locate("/agents"), ::geteuid(),
                                 LoginStamp(runtimeFolder.empty() ? "" : _root.locate(runtimeFolder)),
                                 [this] {
                                     ++_startersMade;
                                     return std::make_unique<Starter>(*this);
                                 });
    }

    // Keeps the labels; the one named "bad" cannot be started.
    struct Starter final : AgentStarter {
        explicit Starter(StartLaunchAgents& owner) : test(owner) {}
        platform::Outcome start(const LaunchAgent& agent) override {
            test._started.push_back(agent.label);
            return agent.label == "bad" ? platform::Outcome::failure({2, "no such thing"})
                                        : platform::Outcome::success();
        }
        std::optional<AgentRun> waitForEnd(const LaunchAgent& /*agent*/) override { return std::nullopt; }
        StartLaunchAgents& test;
    };

    TemporaryRoot _root;
    fakes::FakePlatform _fake;
    const platform::ScopedPlatform _installed{_fake.platform()};
    std::vector<std::string> _started;
    int _startersMade = 0;
};

TEST_F(StartLaunchAgents, StartsEachAgentThatRunsAtLoad) {
    add("a");
    add("b", "");
    add("c");
    logIn();
    EXPECT_EQ(_started, (std::vector<std::string>{"a", "c"}));
    EXPECT_EQ(_startersMade, 1);
}

TEST_F(StartLaunchAgents, DoesSoOncePerLogin) {
    add("a");
    logIn();
    add("b");
    logIn();
    EXPECT_EQ(_started, std::vector<std::string>{"a"});
    LoginStamp(_root.locate("/run")).remove();
    logIn();
    EXPECT_EQ(_started, (std::vector<std::string>{"a", "a", "b"}));
}

TEST_F(StartLaunchAgents, ALoginWithoutAgentsIsOneTooAndLooksForNoStarter) {
    logIn();
    EXPECT_EQ(_startersMade, 0);
    add("a");
    logIn();
    EXPECT_EQ(_started, std::vector<std::string>());
}

TEST_F(StartLaunchAgents, StartsThemWhereThereCanBeNoStamp) {
    add("a");
    logIn("");
    EXPECT_EQ(_started, std::vector<std::string>{"a"});
}

TEST_F(StartLaunchAgents, AnAgentThatCannotBeStartedCostsOneLineAndNoOther) {
    add("bad");
    add("good");
    const StartedAgents started = logIn();
    EXPECT_EQ(_started, (std::vector<std::string>{"bad", "good"}));
    ASSERT_EQ(started.agents.size(), 1U);
    EXPECT_EQ(started.agents[0].label, "good");
    EXPECT_EQ(started.agents[0].file, "good.plist");
    EXPECT_EQ(started.agents[0].content, _root.content("/agents/good.plist"));
    EXPECT_EQ(_fake.systemLog.lines(),
              std::vector<std::string>{"Failed to start launch agent bad: no such thing"});
}

} // namespace
} // namespace welcomer::launch
