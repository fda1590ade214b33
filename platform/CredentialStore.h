// Generic-password items: a secret with a service, an account and a label. At most one item exists for a
// service and an account together. Any thread, all of this.

#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::platform {

// The store's result codes. Their numbers are this system's own; they appear in log lines.
enum CredentialStatus : std::int32_t {
    kCredentialSuccess = 0,       // the operation did what it says
    kCredentialDuplicateItem = 1, // an item with this service and account exists already
    kCredentialItemNotFound = 2,  // no store of the search list holds such an item
    kCredentialStoreDamaged = 3,  // the store's content cannot be read as what it should be
    kCredentialStoreUnsafe = 4,   // the store's file or folder is a symbolic link, or not the user's own
    kCredentialReadFailed = 5,    // the system refused to open or read the store
    kCredentialWriteFailed = 6,   // the system refused to write the store (a full disk, a read-only home)
    kCredentialInvalidPath = 7,   // a trusted application's path that is empty or not absolute
    // Of a store that is a service of the desktop:
    kCredentialLocked = 8,            // the keyring is locked, and nobody can be asked to unlock it
    kCredentialDismissed = 9,         // the user was asked, and refused
    kCredentialPromptUnanswered = 10, // the user was asked, and did not answer in time
    kCredentialNoService = 11,        // no such service runs or can be started
    kCredentialNoBus = 12,            // there is no session bus to ask the service on
    kCredentialTooLarge = 13,         // the secret is larger than the service can take
    kCredentialServiceFailed = 14,    // the service reports a failure of another kind
    // The service, or its bus, did not answer in time: one for each operation. It may still do what it was
    // asked for.
    kCredentialFindTimedOut = 15,
    kCredentialCreateTimedOut = 16,
    kCredentialReadTimedOut = 17,
    kCredentialDeleteTimedOut = 19,
    kCredentialStartFailed = 20, // the service does not run, and starting it failed
    kCredentialBusDied = 21,     // nobody answers where the session bus should be, or it has died meanwhile
    // Of a store that is a file:
    kCredentialStoreInUse = 18, // another process of the user holds it, and did not let go of it in time
    kCredentialNoHome = 22,     // the user has no home folder that it could lie in
};

// The text of a result code, for people; of a time-out, it says which operation that was.
std::string credentialStatusText(std::int32_t status);

// What came of a change to a store. Compares as its status does.
struct CredentialOutcome {
    std::int32_t status = kCredentialSuccess;
    // Of a failure, for people: the path that it was about, and the system's words for it. Empty where the
    // status says all that there is to say.
    std::string detail = {};

    bool operator==(std::int32_t other) const { return status == other; }
};

// The text of an outcome, for people: that of its status, and its detail.
std::string credentialOutcomeText(const CredentialOutcome& outcome);

// Whether a result code says that there is a service, or may be one, that could not be asked: what it holds
// is not known.
bool credentialServiceWasNotAsked(std::int32_t status);

// A program that may read an item without a prompt.
struct TrustedApplication {
    std::string path;
    friend bool operator==(const TrustedApplication&, const TrustedApplication&) = default;
};

// Who may read an item. The backend decides what it enforces, and says so in its header.
struct CredentialAccess {
    std::string description;
    std::vector<TrustedApplication> trustedApplications;
    friend bool operator==(const CredentialAccess&, const CredentialAccess&) = default;
};

// One item, as it lies in a store.
struct CredentialItem {
    std::string service;
    std::string account;
    std::string label;
    std::optional<CredentialAccess> access; // none: the store's default access
    // When the store last changed the item, in seconds since 1970; 0 where it is not known. The store's own:
    // createItem() does not look at it.
    std::int64_t changed = 0;
};

// How much of an item a look-up gives: whether there is one, which asks nobody to unlock anything; its
// attributes and a reference to it; and its secret, too.
enum class CredentialWish { Presence, Item, Secret };

// The store that an item lies in, for people.
struct CredentialStoreDescription {
    std::string name; // such as "local file"
    std::string
        readers; // who can read the item, whatever its access says, such as "every program of this user"
    friend bool operator==(const CredentialStoreDescription&, const CredentialStoreDescription&) = default;
};

// A found item. What it refers to may be gone when it is used; the operation then fails with
// kCredentialItemNotFound.
class CredentialItemReference {
  public:
    virtual ~CredentialItemReference() = default;

    // Where it was found.
    virtual CredentialStoreDescription store() const = 0;
};

// What a look-up has found. On failure there is the status alone.
struct CredentialFinding {
    std::int32_t status = kCredentialItemNotFound; // of finding the item, and its secret where that is wanted
    std::int32_t itemStatus = kCredentialSuccess;  // of reading its attributes
    CredentialItem item;                           // everything of it but its secret; as far as was wanted
    std::string secret;
    std::unique_ptr<CredentialItemReference> reference;

    explicit operator bool() const { return status == kCredentialSuccess; }
};

class CredentialStore {
  public:
    virtual ~CredentialStore() = default;

    // Makes a reference to a trusted application from its path, which is absolute.
    //  result  the status; `application` is written on success only
    virtual std::int32_t createTrustedApplication(const std::string& path, TrustedApplication& application);

    // Makes an access object. `access` is written on success only.
    virtual std::int32_t createAccess(const std::string& description,
                                      std::vector<TrustedApplication> trustedApplications,
                                      CredentialAccess& access);

    // Creates an item in the default store: all or nothing, also when the process is killed meanwhile. An
    // existing item with the same service and account in any store of the search list is not replaced: the
    // call then fails with kCredentialDuplicateItem.
    //  data  the secret, any bytes, none included
    // Any process; may block while another one changes the store.
    virtual CredentialOutcome createItem(const CredentialItem& item, const std::string& data) = 0;

    // Finds the item with this service and account in the search list; the newest, where there is more than
    // one all the same.
    virtual CredentialFinding findItem(const std::string& service, const std::string& account,
                                       CredentialWish wish) = 0;

    // Deletes an item, and with it every other one that the look-up has found by its service and account.
    virtual std::int32_t deleteItem(const CredentialItemReference& reference) = 0;

    // What would keep an item from being created, as far as can be told without writing anything: for
    // reports.
    virtual CredentialOutcome examine() { return {}; }
};

} // namespace welcomer::platform
