#include "backends/desktop/credentials/SecretServiceTraces.h"

#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeProcessIdentity.h"

#include <gtest/gtest.h>

namespace welcomer::desktop {

namespace {

class SecretServiceTracesTest : public testing::Test {
  protected:
    bool has() { return hasSecretServiceTraces(posix::RootFolder(root.path()), identity); }

    TemporaryRoot root;
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
};

class Trace : public SecretServiceTracesTest, public testing::WithParamInterface<const char*> {};

INSTANTIATE_TEST_SUITE_P(
    Files, Trace,
    testing::Values("/usr/share/dbus-1/services/org.freedesktop.secrets.service",
                    "/usr/local/share/dbus-1/services/org.freedesktop.secrets.service",
                    "/home/user/.local/share/dbus-1/services/org.freedesktop.secrets.service",
                    "/home/user/.local/share/keyrings/login.keyring",
                    "/home/user/.local/share/kwalletd/kdewallet.kwl"));

} // namespace

TEST_F(SecretServiceTracesTest, AnEmptyMachineHasNone) {
    EXPECT_FALSE(has());
}

TEST_P(Trace, ItsFileIsOne) {
    root.addFile(GetParam(), "content");
    EXPECT_TRUE(has());
}

TEST_F(SecretServiceTracesTest, AServiceFileWithNothingInItNamesNoService) {
    root.addFile("/usr/share/dbus-1/services/org.freedesktop.secrets.service", "");
    EXPECT_FALSE(has());
}

TEST_F(SecretServiceTracesTest, AFolderWithoutAKeyringIsNone) {
    root.addFile("/home/user/.local/share/keyrings/user.keystore", "content");
    root.addFile("/home/user/.local/share/kwalletd/kdewallet.salt", "content");
    root.addFile("/home/other/.local/share/keyrings/login.keyring", "content");
    EXPECT_FALSE(has());
}

} // namespace welcomer::desktop
