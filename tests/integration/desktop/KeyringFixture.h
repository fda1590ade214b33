// What the tests on a real gnome-keyring share.

#pragma once

#include "backends/desktop/credentials/DesktopCredentialStore.h"
#include "backends/local/credentials/LocalCredentialStore.h"
#include "tests/contract/CredentialStoreContract.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/support/FindCredential.h"
#include "tests/support/KeyringSession.h"

namespace welcomer {

using namespace std::chrono_literals;

// A user's credential store, and what it stands on.
struct UsersCredentials {
    explicit UsersCredentials(const TemporaryRoot& folder, std::chrono::nanoseconds patience = 120s,
                              std::chrono::nanoseconds limit = 60s)
        : root(folder.path()),
          local(root, identity),
          desktop(root, identity, local, {patience, limit}) {
        folder.addDirectory("/home/user/Library");
    }

    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    posix::RootFolder root;
    local::LocalCredentialStore local;
    desktop::DesktopCredentialStore desktop;
};

inline const platform::CredentialItem kItem{"service", "account", "a label", std::nullopt};

class KeyringTest : public testing::Test {
  protected:
    std::int32_t read() { return findCredential(credentials.desktop.store(), &data, &reference); }
    std::int32_t create(const std::string& secret) {
        return credentials.desktop.store().createItem(kItem, secret).status;
    }

    // The same for the local store alone.
    std::int32_t readLocally() { return findCredential(credentials.local, &data, nullptr); }

    // A store whose prompts wait for less.
    UsersCredentials impatient() const { return UsersCredentials(root, 300ms); }

    static std::string lookUpOutside() {
        return outputOf({"secret-tool", "lookup", "service", "service", "account", "account"});
    }

    TemporaryRoot root;
    KeyringSession session;
    UsersCredentials credentials{root};
    std::string data = "untouched";
    std::unique_ptr<platform::CredentialItemReference> reference;
};

} // namespace welcomer
