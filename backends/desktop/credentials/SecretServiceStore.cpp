#include "backends/desktop/credentials/SecretServiceStore.h"

#include "backends/desktop/credentials/AttributeText.h"
#include "backends/desktop/credentials/PromptWait.h"

#include <map>
#include <utility>

namespace welcomer::desktop {

namespace {

using platform::CredentialItem;
using Status = std::int32_t;

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
constexpr char kPropertiesInterface[] = "org.freedesktop.DBus.Properties";
// What gnome-keyring has ask its questions.
constexpr char kPrompterName[] = "org.gnome.keyring.SystemPrompter";
constexpr char kKeyringName[] = "org.gnome.keyring";

using ItemList = std::vector<ObjectPointer<SecretItem>>;

ItemList takeItems(GList* list) {
    ItemList items;
    for (GList* entry = list; entry; entry = entry->next) {
        items.emplace_back(SECRET_ITEM(entry->data));
    }
    g_list_free(list);
    return items;
}

HashTablePointer newAttributes() {
    return HashTablePointer(g_hash_table_new_full(g_str_hash, g_str_equal, g_free, g_free));
}

void setAttribute(GHashTable* attributes, const std::string& key, const std::string& bytes) {
    g_hash_table_insert(attributes, g_strdup(key.c_str()), g_strdup(attributeText(bytes).c_str()));
}

HashTablePointer keyAttributes(const std::string& service, const std::string& account) {
    HashTablePointer attributes = newAttributes();
    setAttribute(attributes.get(), kServiceKey, service);
    setAttribute(attributes.get(), kAccountKey, account);
    return attributes;
}

HashTablePointer allAttributes(const CredentialItem& item) {
    HashTablePointer attributes = keyAttributes(item.service, item.account);
    setAttribute(attributes.get(), kSchemaKey, kSchema);
    if (attributeText(item.label) != item.label) {
        setAttribute(attributes.get(), kLabelKey, item.label);
    }
    if (item.access) {
        setAttribute(attributes.get(), kAccessKey, item.access->description);
        int number = 0;
        for (const platform::TrustedApplication& application : item.access->trustedApplications) {
            setAttribute(attributes.get(), kTrustedApplicationKey + std::to_string(++number),
                         application.path);
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
    explicit Reference(FoundItem found) : _found(std::move(found)) {}
    SecretItem* item() const { return _found.item.get(); }
    const char* path() const { return g_dbus_proxy_get_object_path(G_DBUS_PROXY(item())); }

  private:
    const FoundItem _found;
};

Status loadSecret(SecretItem* item, std::string& data) {
    ErrorSlot error;
    if (!secret_item_load_secret_sync(item, nullptr, error.out())) {
        return statusOf(error.get());
    }
    SecretValue* const value = secret_item_get_secret(item);
    if (!value) {
        return platform::kCredentialServiceFailed;
    }
    gsize length = 0;
    const char* const bytes = secret_value_get(value, &length);
    data.assign(bytes, length);
    secret_value_unref(value);
    return platform::kCredentialSuccess;
}

ObjectPointer<SecretService> connectToService(Status& status) {
    ErrorSlot error;
    ObjectPointer<SecretService> service(secret_service_get_sync(SECRET_SERVICE_NONE, nullptr, error.out()));
    status = service ? platform::kCredentialSuccess : statusOf(error.get());
    return service;
}

} // namespace

Status SecretServiceStore::createTrustedApplication(const std::string& path,
                                                    platform::TrustedApplication& application) noexcept {
    if (!path.starts_with('/')) {
        return platform::kCredentialInvalidPath;
    }
    application.path = path;
    return platform::kCredentialSuccess;
}

Status SecretServiceStore::createAccess(const std::string& description,
                                        std::vector<platform::TrustedApplication> trustedApplications,
                                        platform::CredentialAccess& access) noexcept {
    access = {description, std::move(trustedApplications)};
    return platform::kCredentialSuccess;
}

// The bare question, without the objects of the library: most of the time there is no item.
Status SecretServiceStore::_searchPaths(GDBusConnection* connection, const std::string& service,
                                        const std::string& account, std::size_t& count) {
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
    const VariantPointer unlocked(g_variant_get_child_value(answer.get(), 0));
    const VariantPointer locked(g_variant_get_child_value(answer.get(), 1));
    count = g_variant_n_children(unlocked.get()) + g_variant_n_children(locked.get());
    return platform::kCredentialSuccess;
}

Status SecretServiceStore::_findUnlocked(const std::string& service, const std::string& account,
                                         FoundItem& found) {
    GDBusConnection* const connection = _bus.connection();
    if (!connection) {
        return platform::kCredentialNoBus;
    }
    std::size_t count = 0;
    Status status = _searchPaths(connection, service, account, count);
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    if (count == 0) {
        return platform::kCredentialItemNotFound;
    }
    found.library = connectToService(status);
    if (!found.library) {
        return status;
    }
    ErrorSlot error;
    const HashTablePointer attributes = keyAttributes(service, account);
    ItemList items = takeItems(secret_service_search_sync(found.library.get(), nullptr, attributes.get(),
                                                          SECRET_SEARCH_ALL, nullptr, error.out()));
    if (error) {
        return statusOf(error.get());
    }
    if (items.empty()) {
        return platform::kCredentialItemNotFound;
    }
    for (ObjectPointer<SecretItem>& item : items) {
        if (!secret_item_get_locked(item.get())) {
            found.item = std::move(item);
            return platform::kCredentialSuccess;
        }
    }
    status = _unlock(found.library.get(), G_DBUS_PROXY(items.front().get()));
    if (status == platform::kCredentialSuccess) {
        found.item = std::move(items.front());
    }
    return status;
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

Status SecretServiceStore::_unlock(SecretService* library, GDBusProxy* object) {
    PromptWait wait(_arguments.promptPatience);
    GList objects{object, nullptr, nullptr};
    secret_service_unlock(library, &objects, wait.cancellable(), PromptWait::done, wait.argument());
    GAsyncResult* const result = wait.wait();
    ErrorSlot error;
    const gint unlocked = result ? secret_service_unlock_finish(library, result, nullptr, error.out()) : 0;
    return unlocked > 0 ? platform::kCredentialSuccess : _refusal(wait, error.get());
}

Status SecretServiceStore::_defaultCollection(SecretService* library,
                                              ObjectPointer<SecretCollection>& collection) {
    ErrorSlot error;
    collection.reset(secret_collection_for_alias_sync(library, SECRET_COLLECTION_DEFAULT,
                                                      SECRET_COLLECTION_NONE, nullptr, error.out()));
    if (error) {
        return statusOf(error.get());
    }
    if (collection) {
        return secret_collection_get_locked(collection.get())
                   ? _unlock(library, G_DBUS_PROXY(collection.get()))
                   : platform::kCredentialSuccess;
    }
    // The service asks the user for the new collection's password.
    PromptWait wait(_arguments.promptPatience);
    secret_collection_create(library, "Default", SECRET_COLLECTION_DEFAULT, SECRET_COLLECTION_CREATE_NONE,
                             wait.cancellable(), PromptWait::done, wait.argument());
    GAsyncResult* const result = wait.wait();
    collection.reset(result ? secret_collection_create_finish(result, error.out()) : nullptr);
    if (collection) {
        return platform::kCredentialSuccess;
    }
    // To a refusal the service answers with a collection that is not there.
    const bool isMissing = error && (statusOf(error.get()) == platform::kCredentialItemNotFound ||
                                     g_error_matches(error.get(), SECRET_ERROR, SECRET_ERROR_PROTOCOL));
    return _refusal(wait, isMissing ? nullptr : error.get());
}

Status SecretServiceStore::createItem(const CredentialItem& item, const std::string& data) noexcept {
    const std::lock_guard lock(_mutex);
    GDBusConnection* const connection = _bus.connection();
    if (!connection) {
        return platform::kCredentialNoBus;
    }
    std::size_t count = 0;
    Status status = _searchPaths(connection, item.service, item.account, count);
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    if (count > 0) {
        return platform::kCredentialDuplicateItem;
    }
    if (data.size() > kLargestSecret) {
        return platform::kCredentialTooLarge;
    }
    const ObjectPointer<SecretService> library = connectToService(status);
    if (!library) {
        return status;
    }
    ObjectPointer<SecretCollection> collection;
    status = _defaultCollection(library.get(), collection);
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    const HashTablePointer attributes = allAttributes(item);
    SecretValue* const value =
        secret_value_new(data.data(), static_cast<gssize>(data.size()), "application/octet-stream");
    PromptWait wait(_arguments.promptPatience);
    secret_item_create(collection.get(), nullptr, attributes.get(), attributeText(item.label).c_str(), value,
                       SECRET_ITEM_CREATE_NONE, wait.cancellable(), PromptWait::done, wait.argument());
    secret_value_unref(value);
    GAsyncResult* const result = wait.wait();
    ErrorSlot error;
    const ObjectPointer<SecretItem> created(result ? secret_item_create_finish(result, error.out())
                                                   : nullptr);
    if (created) {
        return platform::kCredentialSuccess;
    }
    status = _refusal(wait, error.get());
    // Whether the item was made is not known, so that no other store may make it too.
    const bool isUnknown = status == platform::kCredentialNoBus || status == platform::kCredentialNoService ||
                           status == platform::kCredentialItemNotFound;
    return isUnknown ? static_cast<Status>(platform::kCredentialServiceFailed) : status;
}

Status SecretServiceStore::findItem(const std::string& service, const std::string& account, std::string* data,
                                    std::unique_ptr<platform::CredentialItemReference>* reference) noexcept {
    const std::lock_guard lock(_mutex);
    FoundItem found;
    Status status = _findUnlocked(service, account, found);
    std::string secret;
    if (status == platform::kCredentialSuccess && data) {
        status = loadSecret(found.item.get(), secret);
    }
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    if (data) {
        *data = std::move(secret);
    }
    if (reference) {
        *reference = std::make_unique<Reference>(std::move(found));
    }
    return platform::kCredentialSuccess;
}

Status SecretServiceStore::readAttributes(const platform::CredentialItemReference& reference,
                                          CredentialItem& item) noexcept {
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

Status SecretServiceStore::deleteItem(const platform::CredentialItemReference& reference) noexcept {
    const std::lock_guard lock(_mutex);
    if (!_bus.connection()) {
        return platform::kCredentialNoBus;
    }
    SecretItem* const item = static_cast<const Reference&>(reference).item();
    PromptWait wait(_arguments.promptPatience);
    secret_item_delete(item, wait.cancellable(), PromptWait::done, wait.argument());
    GAsyncResult* const result = wait.wait();
    ErrorSlot error;
    if (result && secret_item_delete_finish(item, result, error.out())) {
        return platform::kCredentialSuccess;
    }
    return _refusal(wait, error.get());
}

bool SecretServiceStore::describe(platform::BackendReport& report) noexcept {
    const std::lock_guard lock(_mutex);
    GDBusConnection* const connection = _bus.connection();
    if (!connection) {
        report.reason = "the session bus does not answer";
        report.advice = "log in to a desktop session";
        return false;
    }
    Status status = 0;
    const VariantPointer alias =
        callMethod(connection, kSecretServiceName, kSecretServicePath, kServiceInterface, "ReadAlias",
                   g_variant_new("(s)", SECRET_COLLECTION_DEFAULT), status);
    if (!alias || !g_variant_is_of_type(alias.get(), G_VARIANT_TYPE("(o)"))) {
        report.reason = platform::credentialStatusText(alias ? platform::kCredentialServiceFailed : status);
        report.advice = "install and start a Secret Service, such as gnome-keyring";
        return false;
    }
    report.backend = "Secret Service";
    const char* path = nullptr;
    g_variant_get(alias.get(), "(&o)", &path);
    if (std::string(path) == "/") {
        report.reason = "the service runs; there is no default keyring yet";
        report.advice = "the first item that is stored asks for the new keyring's password";
        return true;
    }
    const VariantPointer locked =
        callMethod(connection, kSecretServiceName, path, kPropertiesInterface, "Get",
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
