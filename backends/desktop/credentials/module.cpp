#include "backends/desktop/ModuleEntry.h"
#include "backends/desktop/credentials/CredentialModule.h"
#include "backends/desktop/credentials/SecretServiceReport.h"
#include "backends/desktop/credentials/SecretServiceStore.h"

namespace welcomer::desktop {

namespace {

// Whether there is a service is asked at each operation: it may come and go.
std::unique_ptr<platform::CredentialStore> createCredentialStore(platform::CredentialStore* /*local*/,
                                                                 const CredentialModule::Arguments& arguments,
                                                                 std::string& /*whyNot*/) {
    return std::make_unique<SecretServiceStore>(arguments);
}

bool describeCredentialStore(const CredentialModule::Arguments& /*arguments*/,
                             platform::BackendReport& report) {
    return reportSecretService(report);
}

} // namespace

} // namespace welcomer::desktop

WELCOMER_DESKTOP_MODULE(welcomer::desktop::CredentialModule, welcomer::desktop::createCredentialStore,
                        welcomer::desktop::describeCredentialStore)
