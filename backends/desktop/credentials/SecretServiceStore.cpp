#include "backends/desktop/credentials/SecretServiceStore.h"

#include "backends/desktop/credentials/SecretServiceItem.h"
#include "backends/desktop/credentials/SecretServiceQuestion.h"
#include "platform/KeyedItemReference.h"

#include <string_view>
#include <utility>

namespace welcomer::desktop {

namespace {

using platform::CredentialItem;
using Status = std::int32_t;
using Paths = std::vector<std::string>;

// The objects of the items with a service and an account.
struct SearchResult {
    Paths unlocked;
    Paths locked;
};

Status ofOperation(Status status, platform::CredentialStatus timedOut) {
    return status == kTimedOut ? static_cast<Status>(timedOut) : status;
}

Status search(SecretServiceQuestion& question, const std::string& service, const std::string& account,
              SearchResult& result) {
    Status status = platform::kCredentialSuccess;
    const VariantPointer answer =
        question.call(kSecretService, "SearchItems",
                      g_variant_new("(@a{ss})", searchAttributes(service, account)), "(aoao)", status);
    if (!answer) {
        // A service that knows no search.
        return status == platform::kCredentialItemNotFound
                   ? static_cast<Status>(platform::kCredentialServiceFailed)
                   : status;
    }
    for (const gsize index : {0U, 1U}) {
        const VariantPointer paths(g_variant_get_child_value(answer.get(), index));
        for (gsize i = 0; i < g_variant_n_children(paths.get()); ++i) {
            const char* path = nullptr;
            g_variant_get_child(paths.get(), i, "&o", &path);
            (index == 0 ? result.unlocked : result.locked).emplace_back(path);
        }
    }
    return result.unlocked.empty() && result.locked.empty() ? platform::kCredentialItemNotFound
                                                            : platform::kCredentialSuccess;
}

Status readItem(SecretServiceQuestion& question, const char* path, CredentialItem& item) {
    Status status = platform::kCredentialSuccess;
    const VariantPointer properties = question.readProperties(kSecretItem.at(path), status);
    if (properties) {
        item = itemFrom(properties.get());
    }
    return status;
}

// Reads the item that was changed last. What cannot be looked at is the oldest.
//  result  its path
std::string readNewest(SecretServiceQuestion& question, const Paths& paths,
                       platform::CredentialFinding& found) {
    std::string newest = paths.front();
    std::int64_t changed = -1;
    for (const std::string& path : paths) {
        CredentialItem item;
        const Status status = readItem(question, path.c_str(), item);
        if (status == platform::kCredentialSuccess && item.changed > changed) {
            newest = path;
            changed = item.changed;
            found.item = std::move(item);
            found.itemStatus = status;
        } else if (changed < 0) {
            found.itemStatus = ofOperation(status, platform::kCredentialReadTimedOut);
        }
    }
    return newest;
}

Status loadSecret(SecretServiceQuestion& question, const std::string& path, std::string& data) {
    Status status = question.openSession();
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    SecretService* const library = question.library();
    const VariantPointer answer = question.call(
        kSecretItem.at(path.c_str()), "GetSecret",
        g_variant_new("(o)", secret_service_get_session_dbus_path(library)), "((oayays))", status);
    if (!answer) {
        return status;
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

// Takes the object that a creation has made out of its answer, at once or by a prompt.
//  path  "/" when none was made
Status takeCreated(SecretServiceQuestion& question, GVariant* answer, std::string& path) {
    const char* created = nullptr;
    const char* prompt = nullptr;
    g_variant_get(answer, "(&o&o)", &created, &prompt);
    path = created;
    Status status = platform::kCredentialSuccess;
    if (path == kNoObject && std::string_view(prompt) != kNoObject) {
        const VariantPointer prompted = question.prompt(prompt, "o", status);
        if (prompted) {
            path = g_variant_get_string(prompted.get(), nullptr);
        }
    }
    // To a refusal the service answers with an object that is not there.
    return status == platform::kCredentialSuccess && path == kNoObject ? question.refusal() : status;
}

// Takes one of the items that were found, once it can be read.
Status take(SecretServiceQuestion& question, const SearchResult& items, platform::CredentialWish wish,
            platform::CredentialFinding& found) {
    Status status = platform::kCredentialSuccess;
    // Whether there is one, and what of it shows while it is locked, is no reason to ask anybody.
    if (items.unlocked.empty() && wish != platform::CredentialWish::Presence) {
        status = question.unlock(items.locked);
    }
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    const std::string path =
        readNewest(question, items.unlocked.empty() ? items.locked : items.unlocked, found);
    if (wish == platform::CredentialWish::Secret) {
        status = loadSecret(question, path, found.secret);
    }
    return status;
}

Status openDefaultCollection(SecretServiceQuestion& question, std::string& path) {
    Status status = question.readDefaultAlias(path);
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    if (path != kNoObject) {
        // What is unlocked already stays so without a question.
        return question.unlock({path});
    }
    // The service asks the user for the new collection's password.
    GVariantBuilder properties;
    g_variant_builder_init(&properties, G_VARIANT_TYPE_VARDICT);
    g_variant_builder_add(&properties, "{sv}", "org.freedesktop.Secret.Collection.Label",
                          g_variant_new_string("Default"));
    const VariantPointer answer =
        question.call(kSecretService, "CreateCollection",
                      g_variant_new("(a{sv}s)", &properties, SECRET_COLLECTION_DEFAULT), "(oo)", status);
    return answer ? takeCreated(question, answer.get(), path) : status;
}

Status createIn(SecretServiceQuestion& question, const std::string& collection, const CredentialItem& item,
                const std::string& data) {
    Status status = question.openSession();
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    SecretValue* const value =
        secret_value_new(data.data(), static_cast<gssize>(data.size()), "application/octet-stream");
    GVariant* const encrypted = secret_service_encode_dbus_secret(question.library(), value);
    secret_value_unref(value);
    const VariantPointer answer = question.call(
        kSecretCollection.at(collection.c_str()), "CreateItem",
        g_variant_new("(@a{sv}@(oayays)b)", itemProperties(item), encrypted, FALSE), "(oo)", status);
    if (answer) {
        std::string path;
        status = takeCreated(question, answer.get(), path);
    }
    // Whether the item was made is not known, so that no other store may make it too.
    const bool isUnknown =
        status == platform::kCredentialBusDied || status == platform::kCredentialItemNotFound;
    return isUnknown ? static_cast<Status>(platform::kCredentialServiceFailed) : status;
}

Status deleteObject(SecretServiceQuestion& question, const std::string& path) {
    Status status = platform::kCredentialSuccess;
    const VariantPointer answer =
        question.call(kSecretItem.at(path.c_str()), "Delete", nullptr, "(o)", status);
    if (answer) {
        const char* prompt = nullptr;
        g_variant_get(answer.get(), "(&o)", &prompt);
        if (std::string_view(prompt) != kNoObject) {
            question.prompt(prompt, nullptr, status);
        }
    }
    return status;
}

} // namespace

SecretServiceQuestion SecretServiceStore::_question() {
    return {_bus, _arguments.questionLimit, _arguments.promptPatience};
}

platform::CredentialOutcome SecretServiceStore::createItem(const CredentialItem& item,
                                                           const std::string& data) {
    const std::lock_guard lock(_mutex);
    SecretServiceQuestion question = _question();
    Status status = question.begin();
    SearchResult found;
    if (status == platform::kCredentialSuccess) {
        status = search(question, item.service, item.account, found);
    }
    if (status == platform::kCredentialSuccess) {
        return {platform::kCredentialDuplicateItem};
    }
    if (status == platform::kCredentialItemNotFound && data.size() > kLargestSecret) {
        return {platform::kCredentialTooLarge};
    }
    std::string collection;
    if (status == platform::kCredentialItemNotFound) {
        status = openDefaultCollection(question, collection);
        if (status == platform::kCredentialSuccess) {
            status = createIn(question, collection, item, data);
        }
    }
    return {ofOperation(status, platform::kCredentialCreateTimedOut)};
}

platform::CredentialFinding SecretServiceStore::findItem(const std::string& service,
                                                         const std::string& account,
                                                         platform::CredentialWish wish) {
    const std::lock_guard lock(_mutex);
    SecretServiceQuestion question = _question();
    Status status = question.begin();
    SearchResult items;
    if (status == platform::kCredentialSuccess) {
        status = search(question, service, account, items);
    }
    platform::CredentialFinding found;
    if (status == platform::kCredentialSuccess) {
        status = take(question, items, wish, found);
        found.reference = std::make_unique<platform::KeyedItemReference>(
            platform::CredentialStoreDescription{
                "Secret Service", "every program of the session, while the keyring is unlocked"},
            service, account);
    }
    if (status != platform::kCredentialSuccess) {
        found = {};
    }
    found.status = ofOperation(status, platform::kCredentialFindTimedOut);
    return found;
}

Status SecretServiceStore::deleteItem(const platform::CredentialItemReference& reference) {
    const std::lock_guard lock(_mutex);
    SecretServiceQuestion question = _question();
    const auto& key = static_cast<const platform::KeyedItemReference&>(reference);
    Status result = question.begin();
    SearchResult found;
    if (result == platform::kCredentialSuccess) {
        // Also so that a service that hangs is not asked to delete anything, which it might do later.
        result = search(question, key.service(), key.account(), found);
    }
    if (result == platform::kCredentialSuccess) {
        found.unlocked.insert(found.unlocked.end(), found.locked.begin(), found.locked.end());
        for (const std::string& path : found.unlocked) {
            const Status status = deleteObject(question, path);
            // What has gone meanwhile is as good as deleted.
            if (status != platform::kCredentialSuccess && status != platform::kCredentialItemNotFound) {
                result = status;
            }
        }
    }
    return ofOperation(result, platform::kCredentialDeleteTimedOut);
}

} // namespace welcomer::desktop
