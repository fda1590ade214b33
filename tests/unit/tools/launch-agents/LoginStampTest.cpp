#include "tools/launch-agents/LoginStamp.h"

#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>

namespace welcomer::launch {
namespace {

using Result = LoginStamp::Result;

class LoginStampTest : public testing::Test {
  protected:
    TemporaryRoot _root;
    fakes::FakePlatform _fake;
    const platform::ScopedPlatform _installed{_fake.platform()};
};

TEST_F(LoginStampTest, IsSetOnce) {
    EXPECT_EQ(LoginStamp(_root.path()).set(), Result::Set);
    EXPECT_EQ(LoginStamp(_root.path()).set(), Result::WasThere);
    EXPECT_EQ(_fake.systemLog.lines(), std::vector<std::string>());
}

TEST_F(LoginStampTest, CanBeSetAgainOnceItWasRemoved) {
    const LoginStamp stamp(_root.path());
    EXPECT_EQ(stamp.set(), Result::Set);
    stamp.remove();
    EXPECT_EQ(_root.names(""), std::vector<std::string>());
    EXPECT_EQ(stamp.set(), Result::Set);
}

TEST_F(LoginStampTest, ThatIsALinkToNowhereCounts) {
    ASSERT_EQ(::symlink("nowhere", _root.locate("/welcomer-launch-agents").c_str()), 0);
    EXPECT_EQ(LoginStamp(_root.path()).set(), Result::WasThere);
}

TEST_F(LoginStampTest, IsImpossibleWithoutARuntimeFolder) {
    EXPECT_EQ(LoginStamp("").set(), Result::Impossible);
    EXPECT_EQ(
        _fake.systemLog.lines(),
        std::vector<std::string>{"Launch agents may start more than once: this login has no runtime folder"});
}

TEST_F(LoginStampTest, IsImpossibleInARelativeFolder) {
    EXPECT_EQ(LoginStamp("run").set(), Result::Impossible);
}

TEST_F(LoginStampTest, IsImpossibleInAFolderThatIsMissing) {
    const std::string folder = _root.locate("/missing");
    EXPECT_EQ(LoginStamp(folder).set(), Result::Impossible);
    EXPECT_EQ(_fake.systemLog.lines(),
              std::vector<std::string>{"Launch agents may start more than once: failed to create " + folder +
                                       "/welcomer-launch-agents: No such file or directory"});
}

} // namespace
} // namespace welcomer::launch
