#include "backends/desktop/credentials/SecretServiceStore.h"

#include "backends/desktop/credentials/AttributeText.h"
#include "backends/desktop/credentials/PromptWait.h"

#include <map>
#include <string_view>
#include <utility>

namespace welcomer::desktop {

namespace {

using platform::CredentialItem;
using Status = std::int32_t;

constexpr char kNoObject[] = "/"; // the path that stands for none

constexpr char kSchema[] = "com.corvid.welcomer.Credential";
constexpr char kSchemaKey[] = "xdg:schema";
constexpr char kServiceKey[] = "service";
constexpr char kAccountKey[] = "account";
constexpr char kLabelKey[] = "label"; // only of a label that is no text
constexpr char kAccessKey[] = "access";
constexpr char kTrustedApplicationKey[] = "trusted-application-"; // and its number, from 1 on

constexpr char kServiceInterface[] = "org.freedesktop.Secret.Service";
constexpr char kItemInterface[] = "org.freedesktop.Secret.Item";
constexpr char kCollectionInterface[] = "org.freedesktop.Secret.Collection";
constexpr char kSessionInterface[] = "org.freedesktop.Secret.Session";
constexpr char kPropertiesInterface[] = "org.freedesktop.DBus.Properties";
// What gnome-keyring has ask its questions.
constexpr char kPrompterName[] = "org.gnome.keyring.SystemPrompter";
constexpr char kKeyringName[] = "org.gnome.keyring";

std::map<std::string, std::string> allAttributes(const CredentialItem& item) {
    std::map<std::string, std::string> attributes = {
        {kServiceKey, item.service}, {kAccountKey, item.account}, {kSchemaKey, kSchema}};
    if (attributeText(item.label) != item.label) {
        attributes[kLabelKey] = item.label;
    }
    if (item.access) {
        attributes[kAccessKey] = item.access->description;
        int number = 0;
        for (const platform::TrustedApplication& application : item.access->trustedApplications) {
            attributes[kTrustedApplicationKey + std::to_string(++number)] = application.path;
        }
    }
    return attributes;
}

CredentialItem itemFrom(const std::string& label, const std::map<std::string, std::string>& attributes) {
    const auto bytes = [&](const std::string& key) {
        const auto found = attributes.find(key);
        return found == attributes.end() ? std::string() : bytesOfAttribute(found->second);
    };
    CredentialItem item{bytes(kServiceKey), bytes(kAccountKey), label, std::nullopt};
    if (attributes.contains(kLabelKey)) {
        item.label = bytes(kLabelKey);
    }
    if (attributes.contains(kAccessKey)) {
        item.access = platform::CredentialAccess{bytes(kAccessKey), {}};
        for (int number = 1; attributes.contains(kTrustedApplicationKey + std::to_string(number)); ++number) {
            item.access->trustedApplications.push_back(
                {bytes(kTrustedApplicationKey + std::to_string(number))});
        }
    }
    return item;
}

// What an item's D-Bus properties say.
CredentialItem itemFrom(GVariant* properties) {
    std::string label;
    const char* text = nullptr;
    if (g_variant_lookup(properties, "Label", "&s", &text)) {
        label = text;
    }
    std::map<std::string, std::string> attributes;
    GVariantIter* iterator = nullptr;
    if (g_variant_lookup(properties, "Attributes", "a{ss}", &iterator)) {
        const char* key = nullptr;
        const char* value = nullptr;
        while (g_variant_iter_next(iterator, "{&s&s}", &key, &value)) {
            attributes[key] = value;
        }
        g_variant_iter_free(iterator);
    }
    return itemFrom(label, attributes);
}

class Reference final : public platform::CredentialItemReference {
  public:
    explicit Reference(std::string path) : _path(std::move(path)) {}
    platform::CredentialStoreDescription store() const override {
        return {"Secret Service", "every program of the session, while the keyring is unlocked"};
    }
    const char* path() const { return _path.c_str(); }

  private:
    const std::string _path; // of the item's object, the same in a service that was started anew
};

// The library's object of the service, made for one operation. What it knows (who the service is, and the
// session that secrets are encrypted for) ends with the service, and it learns of that end only where a main
// loop runs: one that was kept would send its calls to nobody once the service has been started anew.
struct CloseLibrary {
    void operator()(SecretService* library) const {
        // Nobody waits for the answer.
        if (const char* const session = secret_service_get_session_dbus_path(library)) {
            g_dbus_connection_call(g_dbus_proxy_get_connection(G_DBUS_PROXY(library)), kSecretServiceName,
                                   session, kSessionInterface, "Close", nullptr, nullptr,
                                   G_DBUS_CALL_FLAGS_NO_AUTO_START, -1, nullptr, nullptr, nullptr);
        }
        g_object_unref(library);
    }
};
using Library = std::unique_ptr<SecretService, CloseLibrary>;

// On the connection that SessionBus keeps.
Library openLibrary(Status& status) {
    ErrorSlot error;
    Library library(
        secret_service_open_sync(SECRET_TYPE_SERVICE, nullptr, SECRET_SERVICE_NONE, nullptr, error.out()));
    status = library ? platform::kCredentialSuccess : statusOf(error.get());
    return library;
}

Status loadSecret(GDBusConnection* connection, SecretService* library, const std::string& path,
                  std::string& data) {
    ErrorSlot error;
    if (!secret_service_ensure_session_sync(library, nullptr, error.out())) {
        return statusOf(error.get());
    }
    Status status = 0;
    const VariantPointer answer =
        callMethod(connection, kSecretServiceName, path.c_str(), kItemInterface, "GetSecret",
                   g_variant_new("(o)", secret_service_get_session_dbus_path(library)), status);
    if (!answer) {
        return status;
    }
    if (!g_variant_is_of_type(answer.get(), G_VARIANT_TYPE("((oayays))"))) {
        return platform::kCredentialServiceFailed;
    }
    const VariantPointer encrypted(g_variant_get_child_value(answer.get(), 0));
    SecretValue* const value = secret_service_decode_dbus_secret(library, encrypted.get());
    if (!value) {
        return platform::kCredentialServiceFailed;
    }
    gsize length = 0;
    const char* const bytes = secret_value_get(value, &length);
    data.assign(bytes, length);
    secret_value_unref(value);
    return platform::kCredentialSuccess;
}

// The path that the default collection has now; "/" when there is none.
Status readDefaultAlias(GDBusConnection* connection, std::string& path) {
    Status status = 0;
    const VariantPointer answer =
        callMethod(connection, kSecretServiceName, kSecretServicePath, kServiceInterface, "ReadAlias",
                   g_variant_new("(s)", SECRET_COLLECTION_DEFAULT), status);
    if (!answer) {
        return status;
    }
    if (!g_variant_is_of_type(answer.get(), G_VARIANT_TYPE("(o)"))) {
        return platform::kCredentialServiceFailed;
    }
    const char* text = nullptr;
    g_variant_get(answer.get(), "(&o)", &text);
    path = text;
    return platform::kCredentialSuccess;
}

// D-Bus properties of an object that is to be made; takes floating references.
HashTablePointer newProperties() {
    return HashTablePointer(g_hash_table_new_full(g_str_hash, g_str_equal, g_free,
                                                  reinterpret_cast<GDestroyNotify>(g_variant_unref)));
}

void setProperty(GHashTable* properties, const char* interface, const char* name, GVariant* value) {
    g_hash_table_insert(properties, g_strconcat(interface, ".", name, nullptr), g_variant_ref_sink(value));
}

HashTablePointer itemProperties(const CredentialItem& item) {
    GVariantBuilder attributes;
    g_variant_builder_init(&attributes, G_VARIANT_TYPE("a{ss}"));
    for (const auto& [key, bytes] : allAttributes(item)) {
        g_variant_builder_add(&attributes, "{ss}", key.c_str(), attributeText(bytes).c_str());
    }
    HashTablePointer properties = newProperties();
    setProperty(properties.get(), kItemInterface, "Attributes", g_variant_builder_end(&attributes));
    setProperty(properties.get(), kItemInterface, "Label",
                g_variant_new_string(attributeText(item.label).c_str()));
    return properties;
}

} // namespace

Status SecretServiceStore::createTrustedApplication(const std::string& path,
                                                    platform::TrustedApplication& application) {
    if (!path.starts_with('/')) {
        return platform::kCredentialInvalidPath;
    }
    application.path = path;
    return platform::kCredentialSuccess;
}

Status SecretServiceStore::createAccess(const std::string& description,
                                        std::vector<platform::TrustedApplication> trustedApplications,
                                        platform::CredentialAccess& access) {
    access = {description, std::move(trustedApplications)};
    return platform::kCredentialSuccess;
}

Status SecretServiceStore::_search(GDBusConnection* connection, const std::string& service,
                                   const std::string& account, SearchResult& result) {
    GVariantBuilder attributes;
    g_variant_builder_init(&attributes, G_VARIANT_TYPE("a{ss}"));
    g_variant_builder_add(&attributes, "{ss}", kServiceKey, attributeText(service).c_str());
    g_variant_builder_add(&attributes, "{ss}", kAccountKey, attributeText(account).c_str());
    Status status = 0;
    const VariantPointer answer =
        callMethod(connection, kSecretServiceName, kSecretServicePath, kServiceInterface, "SearchItems",
                   g_variant_new("(a{ss})", &attributes), status);
    if (!answer) {
        // A service that knows no search is none.
        return status == platform::kCredentialItemNotFound ? platform::kCredentialNoService : status;
    }
    if (!g_variant_is_of_type(answer.get(), G_VARIANT_TYPE("(aoao)"))) {
        return platform::kCredentialServiceFailed;
    }
    for (const bool isLocked : {false, true}) {
        const VariantPointer paths(g_variant_get_child_value(answer.get(), isLocked ? 1 : 0));
        if (g_variant_n_children(paths.get()) > 0) {
            const char* path = nullptr;
            g_variant_get_child(paths.get(), 0, "&o", &path);
            result = {path, isLocked};
            return platform::kCredentialSuccess;
        }
    }
    return platform::kCredentialItemNotFound;
}

// What it means that the user's consent was not given.
Status SecretServiceStore::_refusal(const PromptWait& wait, const GError* error) {
    if (wait.wasGivenUp()) {
        return platform::kCredentialPromptUnanswered;
    }
    if (error) {
        return statusOf(error);
    }
    GDBusConnection* const connection = _bus.connection();
    if (!connection) {
        return platform::kCredentialNoBus;
    }
    // Where nobody could be asked, gnome-keyring says the same as where the user has refused.
    const bool nobodyWasAsked = hasOwner(connection, kKeyringName) && !hasOwner(connection, kPrompterName);
    return nobodyWasAsked ? platform::kCredentialLocked : platform::kCredentialDismissed;
}

Status SecretServiceStore::_unlock(SecretService* library, const std::string& path) {
    PromptWait wait(_arguments.promptPatience);
    const char* paths[] = {path.c_str(), nullptr};
    secret_service_unlock_dbus_paths(library, paths, nullptr, PromptWait::done, wait.argument());
    GAsyncResult* const result = wait.wait();
    ErrorSlot error;
    char** unlocked = nullptr;
    const gint count =
        result ? secret_service_unlock_dbus_paths_finish(library, result, &unlocked, error.out()) : 0;
    g_strfreev(unlocked);
    return count > 0 ? platform::kCredentialSuccess : _refusal(wait, error.get());
}

Status SecretServiceStore::_defaultCollection(GDBusConnection* connection, SecretService* library,
                                              std::string& path) {
    const Status status = readDefaultAlias(connection, path);
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    if (path != kNoObject) {
        // What is unlocked already stays so without a question.
        return _unlock(library, path);
    }
    // The service asks the user for the new collection's password.
    const HashTablePointer properties = newProperties();
    setProperty(properties.get(), kCollectionInterface, "Label", g_variant_new_string("Default"));
    PromptWait wait(_arguments.promptPatience);
    secret_service_create_collection_dbus_path(library, properties.get(), SECRET_COLLECTION_DEFAULT,
                                               SECRET_COLLECTION_CREATE_NONE, nullptr, PromptWait::done,
                                               wait.argument());
    GAsyncResult* const result = wait.wait();
    ErrorSlot error;
    const CharacterPointer created(
        result ? secret_service_create_collection_dbus_path_finish(library, result, error.out()) : nullptr);
    // To a refusal the service answers with a collection that is not there.
    if (created && std::string_view(created.get()) != kNoObject) {
        path = created.get();
        return platform::kCredentialSuccess;
    }
    return _refusal(wait, g_error_matches(error.get(), SECRET_ERROR, SECRET_ERROR_PROTOCOL) ? nullptr
                                                                                            : error.get());
}

Status SecretServiceStore::createItem(const CredentialItem& item, const std::string& data) {
    const std::lock_guard lock(_mutex);
    GDBusConnection* const connection = _bus.connection();
    if (!connection) {
        return platform::kCredentialNoBus;
    }
    SearchResult found;
    Status status = _search(connection, item.service, item.account, found);
    if (status != platform::kCredentialItemNotFound) {
        return status == platform::kCredentialSuccess
                   ? static_cast<Status>(platform::kCredentialDuplicateItem)
                   : status;
    }
    if (data.size() > kLargestSecret) {
        return platform::kCredentialTooLarge;
    }
    const Library library = openLibrary(status);
    if (!library) {
        return status;
    }
    std::string collection;
    status = _defaultCollection(connection, library.get(), collection);
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    const HashTablePointer properties = itemProperties(item);
    SecretValue* const value =
        secret_value_new(data.data(), static_cast<gssize>(data.size()), "application/octet-stream");
    PromptWait wait(_arguments.promptPatience);
    secret_service_create_item_dbus_path(library.get(), collection.c_str(), properties.get(), value,
                                         SECRET_ITEM_CREATE_NONE, nullptr, PromptWait::done, wait.argument());
    secret_value_unref(value);
    GAsyncResult* const result = wait.wait();
    ErrorSlot error;
    const CharacterPointer created(
        result ? secret_service_create_item_dbus_path_finish(library.get(), result, error.out()) : nullptr);
    if (created && std::string_view(created.get()) != kNoObject) {
        return platform::kCredentialSuccess;
    }
    status = _refusal(wait, error.get());
    // Whether the item was made is not known, so that no other store may make it too.
    const bool isUnknown = status == platform::kCredentialNoBus || status == platform::kCredentialNoService ||
                           status == platform::kCredentialItemNotFound;
    return isUnknown ? static_cast<Status>(platform::kCredentialServiceFailed) : status;
}

Status SecretServiceStore::findItem(const std::string& service, const std::string& account, std::string* data,
                                    std::unique_ptr<platform::CredentialItemReference>* reference) {
    const std::lock_guard lock(_mutex);
    GDBusConnection* const connection = _bus.connection();
    if (!connection) {
        return platform::kCredentialNoBus;
    }
    SearchResult found;
    Status status = _search(connection, service, account, found);
    Library library;
    if (status == platform::kCredentialSuccess && (found.isLocked || data)) {
        library = openLibrary(status);
    }
    if (status == platform::kCredentialSuccess && found.isLocked) {
        status = _unlock(library.get(), found.path);
    }
    std::string secret;
    if (status == platform::kCredentialSuccess && data) {
        status = loadSecret(connection, library.get(), found.path, secret);
    }
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    if (data) {
        *data = std::move(secret);
    }
    if (reference) {
        *reference = std::make_unique<Reference>(std::move(found.path));
    }
    return platform::kCredentialSuccess;
}

Status SecretServiceStore::readAttributes(const platform::CredentialItemReference& reference,
                                          CredentialItem& item) {
    const std::lock_guard lock(_mutex);
    GDBusConnection* const connection = _bus.connection();
    if (!connection) {
        return platform::kCredentialNoBus;
    }
    Status status = 0;
    const char* const path = static_cast<const Reference&>(reference).path();
    const VariantPointer answer = callMethod(connection, kSecretServiceName, path, kPropertiesInterface,
                                             "GetAll", g_variant_new("(s)", kItemInterface), status);
    if (!answer) {
        return status;
    }
    const VariantPointer properties(g_variant_get_child_value(answer.get(), 0));
    item = itemFrom(properties.get());
    return platform::kCredentialSuccess;
}

Status SecretServiceStore::deleteItem(const platform::CredentialItemReference& reference) {
    const std::lock_guard lock(_mutex);
    GDBusConnection* const connection = _bus.connection();
    if (!connection) {
        return platform::kCredentialNoBus;
    }
    Status status = 0;
    const Library library = openLibrary(status);
    if (!library) {
        return status;
    }
    PromptWait wait(_arguments.promptPatience);
    secret_service_delete_item_dbus_path(library.get(), static_cast<const Reference&>(reference).path(),
                                         nullptr, PromptWait::done, wait.argument());
    GAsyncResult* const result = wait.wait();
    ErrorSlot error;
    if (result && secret_service_delete_item_dbus_path_finish(library.get(), result, error.out())) {
        return platform::kCredentialSuccess;
    }
    return _refusal(wait, error.get());
}

bool SecretServiceStore::describe(platform::BackendReport& report) {
    const std::lock_guard lock(_mutex);
    GDBusConnection* const connection = _bus.connection();
    if (!connection) {
        report.reason = "the session bus does not answer";
        report.advice = "log in to a desktop session";
        return false;
    }
    std::string path;
    Status status = readDefaultAlias(connection, path);
    if (status != platform::kCredentialSuccess) {
        report.reason = platform::credentialStatusText(status);
        report.advice = "install and start a Secret Service, such as gnome-keyring";
        return false;
    }
    report.backend = "Secret Service";
    if (path == kNoObject) {
        report.reason = "the service runs; there is no default keyring yet";
        report.advice = "the first item that is stored asks for the new keyring's password";
        return true;
    }
    const VariantPointer locked =
        callMethod(connection, kSecretServiceName, path.c_str(), kPropertiesInterface, "Get",
                   g_variant_new("(ss)", kCollectionInterface, "Locked"), status);
    if (!locked || !g_variant_is_of_type(locked.get(), G_VARIANT_TYPE("(v)"))) {
        report.reason = "the service runs; its default keyring cannot be looked at";
        return true;
    }
    const VariantPointer boxed(g_variant_get_child_value(locked.get(), 0));
    const VariantPointer value(g_variant_get_variant(boxed.get()));
    if (g_variant_is_of_type(value.get(), G_VARIANT_TYPE_BOOLEAN) && g_variant_get_boolean(value.get())) {
        report.reason = "the default keyring is locked";
        report.advice = "unlock the keyring; a keyring with the login's password unlocks with the login";
    } else {
        report.reason = "the default keyring is unlocked";
    }
    return true;
}

} // namespace welcomer::desktop
