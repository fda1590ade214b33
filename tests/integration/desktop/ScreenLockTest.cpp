// The screen lock's setting, from the real settings library on a file of the test's own.

#include "backends/desktop/preferences/DesktopPreferenceStore.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakePreferenceStore.h"

#include <gtest/gtest.h>

#include <cstdlib>

namespace welcomer::desktop {

namespace {

constexpr char kDomain[] = "com.corvid.screensaver";

class ScreenLockTest : public testing::Test {
  protected:
    ScreenLockTest() {
        ::setenv("GSETTINGS_BACKEND", "keyfile", 1);
        ::setenv("XDG_CONFIG_HOME", folder.path().c_str(), 1);
    }

    void setTo(const std::string& value) const {
        folder.addFile("/glib-2.0/settings/keyfile",
                       "[org/gnome/desktop/screensaver]\nlock-enabled=" + value + "\n");
    }

    TemporaryRoot folder;
    fakes::CallRecorder recorder;
    fakes::FakePreferenceStore local{recorder};
    DesktopPreferenceStore preferences{local};
};

} // namespace

TEST_F(ScreenLockTest, TheDesktopsSettingIsTheAnswerWhenItIsOff) {
    local.store(kDomain, "askForPassword", true);
    setTo("false");
    EXPECT_EQ(preferences.copyValue("askForPassword", kDomain), PropertyList(false));
    EXPECT_EQ(preferences.report().reason, "lock-enabled is off");
}

TEST_F(ScreenLockTest, TheDesktopsSettingIsTheAnswerWhenItIsOn) {
    local.store(kDomain, "askForPassword", false);
    setTo("true");
    EXPECT_EQ(preferences.copyValue("askForPassword", kDomain), PropertyList(true));
    EXPECT_EQ(preferences.report().reason, "lock-enabled is on");
}

TEST_F(ScreenLockTest, WithoutTheSchemaWhatIsStoredIsTheAnswer) {
    ::setenv("XDG_DATA_DIRS", "/nonexistent", 1);
    ::setenv("XDG_DATA_HOME", "/nonexistent", 1);
    local.store(kDomain, "askForPassword", "stored");
    EXPECT_EQ(preferences.copyValue("askForPassword", kDomain), PropertyList("stored"));
    EXPECT_EQ(preferences.report().backend, "files");
    EXPECT_NE(preferences.report().advice, "");
}

TEST_F(ScreenLockTest, OtherKeysAndDomainsAreTheLocalStores) {
    setTo("true");
    local.store(kDomain, "another", "value");
    local.store("com.corvid.other", "askForPassword", "theirs");
    EXPECT_EQ(preferences.copyValue("another", kDomain), PropertyList("value"));
    EXPECT_EQ(preferences.copyValue("askForPassword", "com.corvid.other"), PropertyList("theirs"));
}

TEST_F(ScreenLockTest, TheSettingIsTheAnswerAmongSeveralValuesToo) {
    setTo("true");
    local.store(kDomain, "askForPassword", "stored");
    local.store(kDomain, "another", "value");
    local.store("com.corvid.other", "askForPassword", "theirs");
    const std::vector<std::string> keys = {"another", "askForPassword"};
    using Values = std::vector<std::optional<PropertyList>>;
    EXPECT_EQ(preferences.copyValues(keys, kDomain), (Values{"value", true}));
    EXPECT_EQ(preferences.copyValues(keys, "com.corvid.other"), (Values{std::nullopt, "theirs"}));
}

} // namespace welcomer::desktop
