#include "backends/desktop/credentials/SecretServiceQuestion.h"

#include "platform/CredentialStore.h"

#include <string_view>

namespace welcomer::desktop {

namespace {

using Status = std::int32_t;

constexpr char kSessionInterface[] = "org.freedesktop.Secret.Session";
// What gnome-keyring has ask its questions.
constexpr char kPrompterName[] = "org.gnome.keyring.SystemPrompter";
constexpr char kKeyringName[] = "org.gnome.keyring";

// What came of a call that ends with cancellation when its time is up.
Status statusOfCall(const PromptWait& wait, const GError* error) {
    return wait.wasGivenUp() ? kTimedOut : statusOf(error);
}

} // namespace

void SecretServiceQuestion::CloseLibrary::operator()(SecretService* library) const {
    // Nobody waits for the answer.
    if (const char* const session = secret_service_get_session_dbus_path(library)) {
        g_dbus_connection_call(g_dbus_proxy_get_connection(G_DBUS_PROXY(library)), kSecretServiceName,
                               session, kSessionInterface, "Close", nullptr, nullptr,
                               G_DBUS_CALL_FLAGS_NO_AUTO_START, -1, nullptr, nullptr, nullptr);
    }
    g_object_unref(library);
}

Status SecretServiceQuestion::begin() {
    Status status = platform::kCredentialSuccess;
    _connection = _bus.connection(_deadline, status);
    return _connection ? startSecretService(_connection, _deadline) : status;
}

Status SecretServiceQuestion::beginToLook(BusName& name) {
    Status status = platform::kCredentialSuccess;
    _connection = _bus.connection(_deadline, status);
    if (!_connection) {
        return status;
    }
    name = lookAtBusName(_connection, kSecretServiceName, kReportMilliseconds);
    return name == BusName::Unknown ? kTimedOut : platform::kCredentialSuccess;
}

VariantPointer SecretServiceQuestion::call(const char* path, const char* interface, const char* method,
                                           GVariant* arguments, const char* type, Status& status) {
    VariantPointer answer =
        callMethod(_connection, kSecretServiceName, path, interface, method, arguments, _deadline, status);
    if (answer && !g_variant_is_of_type(answer.get(), G_VARIANT_TYPE(type))) {
        status = platform::kCredentialServiceFailed;
        return nullptr;
    }
    return answer;
}

VariantPointer SecretServiceQuestion::prompt(const char* path, const char* type, Status& status) {
    status = _openLibrary();
    if (status != platform::kCredentialSuccess) {
        return nullptr;
    }
    const auto start = Deadline::Clock::now();
    PromptWait wait(_promptPatience);
    secret_service_prompt_at_dbus_path(library(), path, type ? G_VARIANT_TYPE(type) : nullptr, nullptr,
                                       PromptWait::done, wait.argument());
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
    const bool nobodyWasAsked =
        hasOwner(_connection, kKeyringName, _deadline) && !hasOwner(_connection, kPrompterName, _deadline);
    return nobodyWasAsked ? platform::kCredentialLocked : platform::kCredentialDismissed;
}

Status SecretServiceQuestion::unlock(const std::vector<std::string>& paths) {
    GVariantBuilder objects;
    g_variant_builder_init(&objects, G_VARIANT_TYPE("ao"));
    for (const std::string& path : paths) {
        g_variant_builder_add(&objects, "o", path.c_str());
    }
    Status status = platform::kCredentialSuccess;
    const VariantPointer answer = call(kSecretServicePath, kServiceInterface, "Unlock",
                                       g_variant_new("(ao)", &objects), "(aoo)", status);
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
    const VariantPointer answer = call(kSecretServicePath, kServiceInterface, "ReadAlias",
                                       g_variant_new("(s)", SECRET_COLLECTION_DEFAULT), "(o)", status);
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
    _opening = std::make_unique<PromptWait>(_deadline.left());
    secret_service_open(SECRET_TYPE_SERVICE, nullptr, SECRET_SERVICE_NONE, _opening->cancellable(),
                        PromptWait::done, _opening->argument());
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
    PromptWait wait(_deadline.left());
    secret_service_ensure_session(library(), wait.cancellable(), PromptWait::done, wait.argument());
    GAsyncResult* const result = wait.wait();
    ErrorSlot error;
    const bool isOpen =
        result && secret_service_ensure_session_finish(library(), result, error.out()) != FALSE;
    return isOpen ? static_cast<Status>(platform::kCredentialSuccess) : statusOfCall(wait, error.get());
}

} // namespace welcomer::desktop
