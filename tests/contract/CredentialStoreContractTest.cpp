// The credential stores of this machine and of the tests; what each of them keeps is asserted in the header.

#include "tests/contract/CredentialStoreContract.h"

#include "backends/local/credentials/LocalCredentialStore.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeCredentialStore.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeProcessIdentity.h"

namespace welcomer::contract {

namespace {

struct LocalCredentials {
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    TemporaryRoot root;
    local::LocalCredentialStore store{posix::RootFolder(root.path()), identity};
    const std::string storeName = "local file";

    LocalCredentials() { root.addDirectory("/home/user/Library"); }
};

struct FakeCredentials {
    fakes::CallRecorder recorder;
    fakes::FakeCredentialStore store{recorder};
    const std::string storeName = "memory";
};

struct BackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, LocalCredentials> ? "Local" : "Fake";
    }
};

using Backends = testing::Types<LocalCredentials, FakeCredentials>;

} // namespace

INSTANTIATE_TYPED_TEST_SUITE_P(Files, CredentialStoreContract, Backends, BackendNames);

} // namespace welcomer::contract
