#include "backends/desktop/credentials/SecretServiceReport.h"

#include "backends/desktop/credentials/SecretServiceQuestion.h"
#include "platform/CredentialStore.h"

namespace welcomer::desktop {

namespace {

using Status = std::int32_t;

bool isLocked(SecretServiceQuestion& question, const std::string& collection, Status& status) {
    const VariantPointer value =
        question.readProperty(kSecretCollection.at(collection.c_str()), "Locked", status);
    return value && g_variant_is_of_type(value.get(), G_VARIANT_TYPE_BOOLEAN) &&
           g_variant_get_boolean(value.get()) != FALSE;
}

// What a service says that runs.
void reportRunning(SecretServiceQuestion& question, platform::BackendReport& report) {
    std::string path;
    Status status = question.readDefaultAlias(path);
    const bool isThere = status == platform::kCredentialSuccess && path != kNoObject;
    const bool locked = isThere && isLocked(question, path, status);
    if (status == kTimedOut) {
        report.reason = "it runs, does not answer";
        report.advice = "end the keyring's daemon, and log in anew";
    } else if (status != platform::kCredentialSuccess) {
        report.reason = isThere ? "the service runs; its default keyring cannot be looked at"
                                : "it runs: " + platform::credentialStatusText(status);
    } else if (!isThere) {
        report.reason = "the service runs; there is no default keyring yet";
        report.advice = "the first item that is stored asks for the new keyring's password";
    } else if (locked) {
        report.reason = "the default keyring is locked";
        report.advice = "unlock the keyring; a keyring with the login's password unlocks with the login";
    } else {
        report.reason = "the default keyring is unlocked";
    }
}

} // namespace

bool reportSecretService(platform::BackendReport& report) {
    Bus bus(G_BUS_TYPE_SESSION, Bus::Sharing::WithLibraries);
    SecretServiceQuestion question(bus, kReportLimit, kReportLimit);
    BusName name = BusName::Unknown;
    const Status status = question.beginToLook(name);
    if (status != platform::kCredentialSuccess) {
        report.backend = "none";
        report.reason = status == kTimedOut
                            ? "the session bus runs, does not answer, so that the keyring cannot be asked"
                            : "the session bus is dead, so that the keyring cannot be asked";
        report.advice = "log in to a desktop session";
        return false;
    }
    if (name == BusName::Nobody) {
        report.reason = platform::credentialStatusText(platform::kCredentialNoService);
        report.advice = "install and start a Secret Service, such as gnome-keyring";
        return false;
    }
    report.backend = "Secret Service";
    if (name == BusName::Startable) {
        report.reason = "it does not run; the session bus starts it when it is needed";
        report.startsWhenAsked = true;
    } else {
        reportRunning(question, report);
    }
    return true;
}

} // namespace welcomer::desktop
