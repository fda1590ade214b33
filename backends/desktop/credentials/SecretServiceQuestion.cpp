#include "backends/desktop/credentials/SecretServiceQuestion.h"

#include "platform/CredentialStore.h"

#include <string_view>

namespace welcomer::desktop {

namespace {

using Status = std::int32_t;

constexpr Peer kSecretSession = kSecretService.as("org.freedesktop.Secret.Session");
// gnome-keyring, and what it has ask its questions; of both the name alone is looked at.
constexpr Peer kKeyring = {"org.gnome.keyring", "/", "", kReportLimit};
constexpr Peer kPrompter = {"org.gnome.keyring.SystemPrompter", "/", "", kReportLimit};

// What came of a call that ends with cancellation when its time is up.
Status statusOfCall(const AsyncCall& wait, const GError* error) {
    return wait.wasGivenUp() ? kTimedOut : statusOf(error);
}

} // namespace

void SecretServiceQuestion::CloseLibrary::operator()(SecretService* library) const {
    // Nobody waits for the answer.
    if (const char* const session = secret_service_get_session_dbus_path(library)) {
        g_dbus_connection_call(g_dbus_proxy_get_connection(G_DBUS_PROXY(library)), kSecretSession.name,
                               session, kSecretSession.interface, "Close", nullptr, nullptr,
                               G_DBUS_CALL_FLAGS_NO_AUTO_START, -1, nullptr, nullptr, nullptr);
    }
    g_object_unref(library);
}

Status SecretServiceQuestion::_connect() {
    ErrorSlot error;
    _connection = _bus.connection(_deadline, error);
    if (_connection) {
        return platform::kCredentialSuccess;
    }
    return isTimeOut(error) ? kTimedOut : static_cast<Status>(platform::kCredentialBusDied);
}

Status SecretServiceQuestion::begin() {
    Status status = _connect();
    if (status != platform::kCredentialSuccess ||
        hasOwner(_connection.get(), kSecretService.within(_deadline.left()))) {
        return status;
    }
    ErrorSlot error;
    const VariantPointer answer =
        desktop::call(_connection.get(), kBusPeer.within(_deadline.left()), "StartServiceByName",
                      g_variant_new("(su)", kSecretService.name, 0U), nullptr, error);
    if (answer) {
        return platform::kCredentialSuccess;
    }
    if (g_error_matches(error.get(), G_DBUS_ERROR, G_DBUS_ERROR_SERVICE_UNKNOWN)) {
        return platform::kCredentialNoService;
    }
    status = statusOf(error.get());
    return status == kTimedOut || status == platform::kCredentialBusDied
               ? status
               : static_cast<Status>(platform::kCredentialStartFailed);
}

Status SecretServiceQuestion::beginToLook(BusName& name) {
    const Status status = _connect();
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    name = lookAtName(_connection.get(), kSecretService);
    return name == BusName::Unknown ? kTimedOut : platform::kCredentialSuccess;
}

VariantPointer SecretServiceQuestion::call(const Peer& peer, const char* method, GVariant* arguments,
                                           const char* type, Status& status) {
    ErrorSlot error;
    VariantPointer answer =
        desktop::call(_connection.get(), peer.within(_deadline.left()), method, arguments, type, error);
    status = answer ? platform::kCredentialSuccess : statusOf(error.get());
    return answer;
}

VariantPointer SecretServiceQuestion::readProperty(const Peer& peer, const char* name, Status& status) {
    ErrorSlot error;
    VariantPointer value =
        desktop::readProperty(_connection.get(), peer.within(_deadline.left()), name, error);
    status = value ? platform::kCredentialSuccess : statusOf(error.get());
    return value;
}

VariantPointer SecretServiceQuestion::readProperties(const Peer& peer, Status& status) {
    ErrorSlot error;
    VariantPointer values = desktop::readProperties(_connection.get(), peer.within(_deadline.left()), error);
    status = values ? platform::kCredentialSuccess : statusOf(error.get());
    return values;
}

VariantPointer SecretServiceQuestion::prompt(const char* path, const char* type, Status& status) {
    status = _openLibrary();
    if (status != platform::kCredentialSuccess) {
        return nullptr;
    }
    const auto start = Deadline::Clock::now();
    AsyncCall wait(_promptPatience);
    secret_service_prompt_at_dbus_path(library(), path, type ? G_VARIANT_TYPE(type) : nullptr, nullptr,
                                       AsyncCall::done, wait.argument());
    GAsyncResult* const result = wait.wait();
    _deadline.add(Deadline::Clock::now() - start);
    ErrorSlot error;
    VariantPointer answer(result ? secret_service_prompt_at_dbus_path_finish(library(), result, error.out())
                                 : nullptr);
    if (wait.wasGivenUp()) {
        status = platform::kCredentialPromptUnanswered;
    } else if (!answer) {
        status = error ? statusOf(error.get()) : refusal();
    }
    return status == platform::kCredentialSuccess ? std::move(answer) : nullptr;
}

Status SecretServiceQuestion::refusal() const {
    // Where nobody could be asked, gnome-keyring says the same as where the user has refused.
    const bool nobodyWasAsked = hasOwner(_connection.get(), kKeyring.within(_deadline.left())) &&
                                !hasOwner(_connection.get(), kPrompter.within(_deadline.left()));
    return nobodyWasAsked ? platform::kCredentialLocked : platform::kCredentialDismissed;
}

Status SecretServiceQuestion::unlock(const std::vector<std::string>& paths) {
    GVariantBuilder objects;
    g_variant_builder_init(&objects, G_VARIANT_TYPE("ao"));
    for (const std::string& path : paths) {
        g_variant_builder_add(&objects, "o", path.c_str());
    }
    Status status = platform::kCredentialSuccess;
    const VariantPointer answer =
        call(kSecretService, "Unlock", g_variant_new("(ao)", &objects), "(aoo)", status);
    if (!answer) {
        return status;
    }
    VariantPointer unlocked(g_variant_get_child_value(answer.get(), 0));
    const char* path = nullptr;
    g_variant_get_child(answer.get(), 1, "&o", &path);
    if (std::string_view(path) != kNoObject) {
        VariantPointer more = prompt(path, "ao", status);
        if (status == platform::kCredentialSuccess && g_variant_n_children(more.get()) > 0) {
            unlocked = std::move(more);
        }
    }
    if (g_variant_n_children(unlocked.get()) > 0) {
        return platform::kCredentialSuccess;
    }
    return status == platform::kCredentialSuccess ? refusal() : status;
}

Status SecretServiceQuestion::readDefaultAlias(std::string& path) {
    Status status = platform::kCredentialSuccess;
    const VariantPointer answer =
        call(kSecretService, "ReadAlias", g_variant_new("(s)", SECRET_COLLECTION_DEFAULT), "(o)", status);
    if (answer) {
        const char* text = nullptr;
        g_variant_get(answer.get(), "(&o)", &text);
        path = text;
    }
    return status;
}

Status SecretServiceQuestion::_openLibrary() {
    if (_library) {
        return platform::kCredentialSuccess;
    }
    _opening = std::make_unique<AsyncCall>(_deadline.left());
    secret_service_open(SECRET_TYPE_SERVICE, nullptr, SECRET_SERVICE_NONE, _opening->cancellable(),
                        AsyncCall::done, _opening->argument());
    GAsyncResult* const result = _opening->wait();
    ErrorSlot error;
    _library.reset(result ? secret_service_open_finish(result, error.out()) : nullptr);
    return _library ? static_cast<Status>(platform::kCredentialSuccess)
                    : statusOfCall(*_opening, error.get());
}

Status SecretServiceQuestion::openSession() {
    const Status status = _openLibrary();
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    AsyncCall wait(_deadline.left());
    secret_service_ensure_session(library(), wait.cancellable(), AsyncCall::done, wait.argument());
    GAsyncResult* const result = wait.wait();
    ErrorSlot error;
    const bool isOpen =
        result && secret_service_ensure_session_finish(library(), result, error.out()) != FALSE;
    return isOpen ? static_cast<Status>(platform::kCredentialSuccess) : statusOfCall(wait, error.get());
}

} // namespace welcomer::desktop
