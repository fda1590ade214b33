// The cloud account framework: accounts, their services, and signing in.

#pragma once

#include "platform/Window.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

namespace welcomer::platform {

// The services of an account. Their texts are this system's own: they are only passed around, compared, shown
// in log lines and kept in the account service's files.
inline constexpr char kSKServiceIDContacts[] = "com.corvid.nimbus.service.contacts";
inline constexpr char kSKServiceIDCalendars[] = "com.corvid.nimbus.service.calendars";
inline constexpr char kSKServiceIDBookMarks[] = "com.corvid.nimbus.service.bookmarks";
inline constexpr char kSKServiceIDMediaStream[] = "com.corvid.nimbus.service.mediastream";
inline constexpr char kSKServiceIDReminders[] = "com.corvid.nimbus.service.reminders";
inline constexpr char kSKServiceIDAccountSync[] = "com.corvid.nimbus.service.accountsync";
inline constexpr char kSKServiceIDNotes[] = "com.corvid.nimbus.service.notes";
inline constexpr char kSKServiceIDMail[] = "com.corvid.nimbus.service.mail";
inline constexpr char kSKServiceIDLOC[] = "com.corvid.nimbus.service.locator";
inline constexpr char kSKServiceMobileDocuments[] = "com.corvid.nimbus.service.documents";

// All of them, in the order in which setup enables them.
inline constexpr const char* kSKServiceIDs[] = {
    kSKServiceIDContacts,  kSKServiceIDCalendars,    kSKServiceIDBookMarks, kSKServiceIDMediaStream,
    kSKServiceIDReminders, kSKServiceIDAccountSync,  kSKServiceIDLOC,       kSKServiceIDMail,
    kSKServiceIDNotes,     kSKServiceMobileDocuments};

// Property keys of accounts, services and notifications.
inline constexpr char kSKPropertyAccountID[] = "com.corvid.nimbus.property.accountID";
inline constexpr char kSKPropertyMailEmailAddress[] = "com.corvid.nimbus.property.mailEmailAddress";
inline constexpr char kSKPropertyAccountError[] = "com.corvid.nimbus.property.accountError";
inline constexpr char kSKPropertyAccountErrorInfo[] = "com.corvid.nimbus.property.accountErrorInfo";

// The entries of a request and of its response that this system reads: what is asked of each delegate and
// what each was answered, a dictionary from delegate identifier; and an integer, 0 for success.
inline constexpr char kDelegatesKey[] = "delegates";
inline constexpr char kStatusKey[] = "status";

// The notifications that end an authentication and a sign-in. A completed one carries the server's response,
// with its status; a failed one the account error (an integer under kSKPropertyAccountError) and, where there
// is more to say, its info.
inline constexpr char kSKNotificationAuthenticationCompleted[] =
    "com.corvid.nimbus.notification.authenticationCompleted";
inline constexpr char kSKNotificationAuthenticationFailed[] =
    "com.corvid.nimbus.notification.authenticationFailed";
inline constexpr char kSKNotificationSignInCompleted[] = "com.corvid.nimbus.notification.signInCompleted";
inline constexpr char kSKNotificationSignInFailed[] = "com.corvid.nimbus.notification.signInFailed";

// Account errors. The system tells none, the terms of service and repair apart; the other numbers are for
// people.
inline constexpr std::int64_t kSKAccountErrorNone = 0;
inline constexpr std::int64_t kSKAccountErrorWrongPassword = 1;
inline constexpr std::int64_t kSKAccountErrorUnknownUser = 2;
inline constexpr std::int64_t kSKAccountErrorTermsOfService = 3; // new ones are to be accepted
inline constexpr std::int64_t kSKAccountErrorServerUnavailable = 4;
inline constexpr std::int64_t kSKAccountErrorRepair = 5;    // the account is to be repaired
inline constexpr std::int64_t kSKAccountErrorNotStored = 6; // signed in, but the account could not be kept

// One service of one account. Any thread.
class CloudService {
  public:
    virtual ~CloudService() = default;

    // Whether this machine and this user can have the service enabled.
    virtual bool canBeEnabled() = 0;

    // The value of one of the service's properties, or none.
    virtual std::optional<PropertyList> propertyValue(const std::string& key) = 0;

    // Turns the service on or off, with an interface where the account service has one to show. What became
    // of it is not reported.
    //  creating  whether the service is being set up for the first time
    //  window    the parent of that interface; borrowed for the call
    virtual void enableWithWindow(bool enabled, bool creating, Window* window) = 0;

    // The same without any interface.
    virtual void enableSilently(bool enabled) = 0;
};

// One cloud account of the current user. Any thread.
class CloudAccount {
  public:
    virtual ~CloudAccount() = default;

    // The account's user name.
    virtual std::string accountID() = 0;

    // Keeps the account service from showing its own dialogs about failures of this account, for as long as
    // the process lives.
    virtual void suppressFailureDialogs() = 0;

    // The account's service with this identifier, or null when it has none. The service keeps what it needs
    // alive.
    virtual std::shared_ptr<CloudService> serviceForID(const std::string& identifier) = 0;
};

// The shared account manager. Any thread, but where something else is said.
class AccountManager {
  public:
    virtual ~AccountManager() = default;

    // The account with this identifier, or null.
    //  identifier       as it came from the caller; the manager has no account for none, for an empty text
    //                   and for what is no text
    //  createIfMissing  whether to make an account that does not exist; null then says that it could not be
    //                   made
    virtual std::shared_ptr<CloudAccount> accountForID(const std::optional<PropertyList>& identifier,
                                                       bool createIfMissing) = 0;

    // Starts to check a user's password with the server and returns. The answer comes as exactly one
    // authentication-completed or authentication-failed notification on the default centre, on the run loop
    // of the thread that called, which must run it; a port is attached to that loop until then. There is no
    // time limit.
    //  delegateRequest  what is asked of each delegate, under kDelegatesKey
    virtual void authenticate(const std::string& username, const std::string& password,
                              const PropertyList::Dictionary& delegateRequest) = 0;

    // The same, and signs the user in: the account is made where it is missing, and is the logged-in account
    // from then on. Ends in a sign-in-completed or a sign-in-failed notification.
    virtual void finishSignIn(const std::string& username, const std::string& password,
                              const PropertyList::Dictionary& delegateRequest) = 0;

    // Says that setup has finished. The system has nothing to add and always passes none.
    virtual void markSetupFinished(const std::optional<PropertyList>& information) = 0;
};

// Any thread.
class AccountService {
  public:
    virtual ~AccountService() = default;

    // Lives as long as this object.
    virtual AccountManager& sharedManager() = 0;

    // The account that is logged in for the current user, or null.
    virtual std::shared_ptr<CloudAccount> loggedInAccount() = 0;

    // Whether a service of an account is enabled; false for no account and for a service that it does not
    // have.
    //  account  borrowed for the call; may be null
    virtual bool isServiceEnabled(CloudAccount* account, const std::string& identifier) = 0;
};

} // namespace welcomer::platform
