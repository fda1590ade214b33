#include "platform/CredentialStore.h"

#include <utility>

namespace welcomer::platform {

std::string credentialStatusText(std::int32_t status) {
    switch (status) {
    case kCredentialSuccess:
        return "success";
    case kCredentialDuplicateItem:
        return "an item with this service and account exists already";
    case kCredentialItemNotFound:
        return "no such item";
    case kCredentialStoreDamaged:
        return "the credential store is damaged";
    case kCredentialStoreUnsafe:
        return "the credential store is a symbolic link or not the user's own";
    case kCredentialReadFailed:
        return "the credential store cannot be read";
    case kCredentialWriteFailed:
        return "the credential store cannot be written";
    case kCredentialInvalidPath:
        return "a trusted application needs an absolute path";
    case kCredentialLocked:
        return "the keyring is locked, and nobody can be asked to unlock it";
    case kCredentialDismissed:
        return "the user refused to unlock or to change the keyring";
    case kCredentialPromptUnanswered:
        return "the prompt of the keyring was not answered in time";
    case kCredentialNoService:
        return "no credential service runs or can be started";
    case kCredentialNoBus:
        return "the keyring could not be asked: there is no session bus";
    case kCredentialTooLarge:
        return "the secret is too large for the credential service";
    case kCredentialServiceFailed:
        return "the credential service failed";
    case kCredentialFindTimedOut:
        return "the keyring could not be asked for the item: no answer within 10 seconds";
    case kCredentialCreateTimedOut:
        return "the keyring could not be asked to create the item: no answer within 10 seconds; it may still "
               "create it";
    case kCredentialReadTimedOut:
        return "the keyring could not be asked for the item's attributes: no answer within 10 seconds";
    case kCredentialDeleteTimedOut:
        return "the keyring could not be asked to delete the item: no answer within 10 seconds; it may still "
               "delete it";
    case kCredentialStartFailed:
        return "the keyring could not be asked: it does not run, and starting it failed";
    case kCredentialBusDied:
        return "the keyring could not be asked: the session bus is dead";
    case kCredentialStoreInUse:
        return "the credential store is locked by another process: waited 10 seconds";
    case kCredentialNoHome:
        return "the user has no home folder";
    default:
        return "unknown credential store status " + std::to_string(status);
    }
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
