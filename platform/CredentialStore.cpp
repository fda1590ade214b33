#include "platform/CredentialStore.h"

#include <algorithm>
#include <iterator>
#include <utility>

namespace welcomer::platform {

namespace {

struct StatusText {
    std::int32_t status;
    const char* text;
};

constexpr StatusText kStatusTexts[] = {
    {kCredentialSuccess, "success"},
    {kCredentialDuplicateItem, "an item with this service and account exists already"},
    {kCredentialItemNotFound, "no such item"},
    {kCredentialStoreDamaged, "the credential store is damaged"},
    {kCredentialStoreUnsafe, "the credential store is a symbolic link or not the user's own"},
    {kCredentialReadFailed, "the credential store cannot be read"},
    {kCredentialWriteFailed, "the credential store cannot be written"},
    {kCredentialInvalidPath, "a trusted application needs an absolute path"},
    {kCredentialLocked, "the keyring is locked, and nobody can be asked to unlock it"},
    {kCredentialDismissed, "the user refused to unlock or to change the keyring"},
    {kCredentialPromptUnanswered, "the prompt of the keyring was not answered in time"},
    {kCredentialNoService, "no credential service runs or can be started"},
    {kCredentialNoBus, "the keyring could not be asked: there is no session bus"},
    {kCredentialTooLarge, "the secret is too large for the credential service"},
    {kCredentialServiceFailed, "the credential service failed"},
    {kCredentialFindTimedOut, "the keyring could not be asked for the item: no answer within 10 seconds"},
    {kCredentialCreateTimedOut,
     "the keyring could not be asked to create the item: no answer within 10 seconds; it may still "
     "create it"},
    {kCredentialReadTimedOut,
     "the keyring could not be asked for the item's attributes: no answer within 10 seconds"},
    {kCredentialDeleteTimedOut,
     "the keyring could not be asked to delete the item: no answer within 10 seconds; it may still "
     "delete it"},
    {kCredentialStartFailed, "the keyring could not be asked: it does not run, and starting it failed"},
    {kCredentialBusDied, "the keyring could not be asked: the session bus is dead"},
    {kCredentialStoreInUse, "the credential store is locked by another process: waited 10 seconds"},
    {kCredentialNoHome, "the user has no home folder"},
};

} // namespace

std::string credentialStatusText(std::int32_t status) {
    const auto* const found = std::ranges::find(kStatusTexts, status, &StatusText::status);
    return found != std::end(kStatusTexts) ? found->text
                                           : "unknown credential store status " + std::to_string(status);
}

std::string credentialOutcomeText(const CredentialOutcome& outcome) {
    const std::string text = credentialStatusText(outcome.status);
    return outcome.detail.empty() ? text : text + ": " + outcome.detail;
}

bool credentialServiceWasNotAsked(std::int32_t status) {
    switch (status) {
    case kCredentialNoBus:
    case kCredentialFindTimedOut:
    case kCredentialCreateTimedOut:
    case kCredentialReadTimedOut:
    case kCredentialDeleteTimedOut:
    case kCredentialStartFailed:
    case kCredentialBusDied:
        return true;
    default:
        return false;
    }
}

std::int32_t CredentialStore::createTrustedApplication(const std::string& path,
                                                       TrustedApplication& application) {
    if (!path.starts_with('/')) {
        return kCredentialInvalidPath;
    }
    application.path = path;
    return kCredentialSuccess;
}

std::int32_t CredentialStore::createAccess(const std::string& description,
                                           std::vector<TrustedApplication> trustedApplications,
                                           CredentialAccess& access) {
    access = {description, std::move(trustedApplications)};
    return kCredentialSuccess;
}

} // namespace welcomer::platform
