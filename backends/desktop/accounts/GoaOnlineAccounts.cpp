#include "backends/desktop/accounts/GoaOnlineAccounts.h"

#include "backends/bus/BusCall.h"
#include "backends/desktop/glib/MainContext.h"
#include "backends/posix/OwnProcess.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <utility>

#define GOA_API_IS_SUBJECT_TO_CHANGE
#include <goa/goa.h>

namespace welcomer::desktop {

namespace {

constexpr Peer kManager = {"org.gnome.OnlineAccounts", "/org/gnome/OnlineAccounts/Manager",
                           "org.gnome.OnlineAccounts.Manager", std::chrono::minutes(2)};
constexpr Peer kObjectManager = {kManager.name, "/org/gnome/OnlineAccounts",
                                 "org.freedesktop.DBus.ObjectManager", kReportLimit};
// An account, once it has a path.
constexpr Peer kAccount = {kManager.name, "/", "org.gnome.OnlineAccounts.Account", std::chrono::seconds(25)};

constexpr std::chrono::seconds kEffectLimit{10};
constexpr std::chrono::seconds kPatience{10};

// By OnlineFeature: what the account's switch, the feature's interface, and the detail of a new account are
// called.
struct FeatureNames {
    const char* property;
    const char* interface;
    const char* detail;
};
constexpr std::array<FeatureNames, kOnlineFeatureCount> kFeatureNames = {{
    {"ContactsDisabled", "org.gnome.OnlineAccounts.Contacts", "ContactsEnabled"},
    {"CalendarDisabled", "org.gnome.OnlineAccounts.Calendar", "CalendarEnabled"},
    {"FilesDisabled", "org.gnome.OnlineAccounts.Files", "FilesEnabled"},
    {"MailDisabled", "org.gnome.OnlineAccounts.Mail", "MailEnabled"},
}};

const FeatureNames& namesOf(OnlineFeature feature) {
    return kFeatureNames[static_cast<std::size_t>(feature)];
}

std::string text(const char* string) {
    return string ? string : "";
}

// The bus ends the connection of who sends a string that is none of its own.
bool canBeSent(const std::string& string) {
    return g_utf8_validate(string.data(), static_cast<gssize>(string.size()), nullptr) != FALSE;
}

// Where the library delivers what concerns the objects that are made meanwhile on this thread.
class PrivateContext {
  public:
    PrivateContext() = default;
    ~PrivateContext() { _context.deliver(); } // what the objects have left behind is freed
    PrivateContext(const PrivateContext&) = delete;
    PrivateContext& operator=(const PrivateContext&) = delete;

    const MainContext& get() const { return _context; }

  private:
    MainContext _context;
    const MainContext::Scope _scope{_context};
};

using ObjectManager = ObjectPointer<GDBusObjectManager>;

// What the daemon has, kept up to date while this thread's context is iterated; null where nobody has the
// daemon's name. Without a daemon the library gives an object all the same, an empty one.
ObjectManager lookAtDaemon(GDBusConnection* bus) {
    ObjectManager manager(goa_object_manager_client_new_sync(bus, G_DBUS_OBJECT_MANAGER_CLIENT_FLAGS_NONE,
                                                             kObjectManager.name, kObjectManager.path,
                                                             nullptr, nullptr));
    const TextPointer owner(
        manager ? g_dbus_object_manager_client_get_name_owner(G_DBUS_OBJECT_MANAGER_CLIENT(manager.get()))
                : nullptr);
    return owner ? std::move(manager) : nullptr;
}

bool hasInterface(GDBusObjectManager* manager, const std::string& path, OnlineFeature feature) {
    const ObjectPointer<GDBusInterface> interface(
        g_dbus_object_manager_get_interface(manager, path.c_str(), namesOf(feature).interface));
    return interface != nullptr;
}

OnlineAccount describe(GoaObject* object, GoaAccount* account) {
    OnlineAccount description;
    description.path = text(g_dbus_object_get_object_path(G_DBUS_OBJECT(object)));
    description.providerType = text(goa_account_get_provider_type(account));
    description.identity = text(goa_account_get_identity(account));
    description.presentationIdentity = text(goa_account_get_presentation_identity(account));
    GoaMail* mail = goa_object_peek_mail(object);
    description.switches = {{
        {goa_account_get_contacts_disabled(account) != FALSE, goa_object_peek_contacts(object) != nullptr},
        {goa_account_get_calendar_disabled(account) != FALSE, goa_object_peek_calendar(object) != nullptr},
        {goa_account_get_files_disabled(account) != FALSE, goa_object_peek_files(object) != nullptr},
        {goa_account_get_mail_disabled(account) != FALSE, mail != nullptr},
    }};
    if (mail) {
        description.mailAddress = text(goa_mail_get_email_address(mail));
    }
    return description;
}

// Paths end in "account_<seconds>_<number>".
bool isOlder(const OnlineAccount& left, const OnlineAccount& right) {
    return std::pair(left.path.size(), left.path) < std::pair(right.path.size(), right.path);
}

// The account's name for people: "anna@cloud.example".
std::string presentation(const NewOnlineAccount& account) {
    char* host = nullptr;
    g_uri_split(account.serverAddress.c_str(), G_URI_FLAGS_NONE, nullptr, nullptr, &host, nullptr, nullptr,
                nullptr, nullptr, nullptr);
    const TextPointer owner(host);
    return !host || account.identity.find('@') != std::string::npos ? account.identity
                                                                    : account.identity + "@" + host;
}

// Not with GLib, which a process that was forked cannot use.
bool addAccount(const NewOnlineAccount& account, const std::string& presentation) {
    const bus::Bus session = bus::openSessionBus(kPatience);
    if (!session) {
        return false;
    }
    bus::Call call(session.get(), kManager, "AddAccount");
    call.append("sss", account.providerType.c_str(), account.identity.c_str(), presentation.c_str())
        .open('a', "{sv}")
        .open('e', "sv")
        .append("s", "password")
        .open('v', "s")
        .append("s", account.password.text().c_str())
        .close(3)
        .open('a', "{ss}")
        .append("{ss}", "Uri", account.serverAddress.c_str())
        .append("{ss}", "AcceptSslErrors", "false");
    for (std::size_t i = 0; i < kOnlineFeatureCount; ++i) {
        call.append("{ss}", kFeatureNames[i].detail, account.isOn[i] ? "true" : "false");
    }
    return static_cast<bool>(call.close().send());
}

} // namespace

GoaOnlineAccounts::Daemon GoaOnlineAccounts::look() {
    const BusConnection bus = _connection(Deadline(kReportLimit));
    switch (bus ? lookAtName(bus.get(), kObjectManager) : BusName::Unknown) {
    case BusName::Unknown:
        return Daemon::WithoutBus;
    case BusName::Nobody:
        return Daemon::Absent;
    case BusName::Startable:
        return Daemon::Startable;
    case BusName::Owned:
        break;
    }
    ErrorSlot error;
    const VariantPointer answer =
        call(bus.get(), kObjectManager, "GetManagedObjects", nullptr, nullptr, error);
    return answer ? Daemon::Answers : Daemon::Silent;
}

std::optional<std::vector<OnlineAccount>> GoaOnlineAccounts::list() {
    const Deadline patience(kPatience);
    const BusConnection bus = _connection(patience);
    if (!bus) {
        return std::nullopt;
    }
    const PrivateContext context;
    const ObjectManager manager = lookAtDaemon(bus.get());
    if (!manager) {
        _isGivenUp = _isGivenUp || patience.left().count() == 0;
        return std::nullopt;
    }
    std::vector<OnlineAccount> accounts;
    GList* const objects = g_dbus_object_manager_get_objects(manager.get());
    for (GList* node = objects; node; node = node->next) {
        GoaObject* const object = GOA_OBJECT(node->data);
        if (GoaAccount* const account = goa_object_peek_account(object)) {
            accounts.push_back(describe(object, account));
        }
    }
    g_list_free_full(objects, g_object_unref);
    std::sort(accounts.begin(), accounts.end(), isOlder);
    return accounts;
}

// The library's setters return before the daemon has the value: a short process would lose it.
bool GoaOnlineAccounts::setFeature(const OnlineAccount& account, OnlineFeature feature, bool isOn) {
    const BusConnection bus = _connection(Deadline(kPatience));
    if (!bus) {
        return false;
    }
    const PrivateContext context;
    const ObjectManager manager = lookAtDaemon(bus.get());
    ErrorSlot error;
    // An account that has gone has no interface and gets none; so has one whose daemon has gone.
    return manager &&
           writeProperty(bus.get(), kAccount.at(account.path.c_str()), namesOf(feature).property,
                         g_variant_new_boolean(!isOn), error) &&
           context.get().waitUntil([&] { return hasInterface(manager.get(), account.path, feature) == isOn; },
                                   Deadline(kEffectLimit));
}

bool GoaOnlineAccounts::makeOnce(const NewOnlineAccount& account) {
    if (!canBeSent(account.identity) || !canBeSent(account.password.text())) {
        return false;
    }
    const std::lock_guard threads(_making);
    const posix::FileLock lock = _lock();
    if (!lock) {
        return false;
    }
    const auto accounts = list();
    if (!accounts) {
        return false;
    }
    const bool isThere = std::any_of(accounts->begin(), accounts->end(), [&](const OnlineAccount& other) {
        return other.providerType == account.providerType && other.identity == account.identity;
    });
    // Whichever library speaks on the bus, it leaves copies of the password: they go with the process.
    return isThere || posix::succeedsInAProcessOfItsOwn(
                          [&account, name = presentation(account)] { return addAccount(account, name); });
}

BusConnection GoaOnlineAccounts::_connection(const Deadline& deadline) {
    if (_isGivenUp) {
        return nullptr;
    }
    ErrorSlot error;
    BusConnection connection = _bus.connection(deadline, error);
    _isGivenUp = _isGivenUp || isTimeOut(error);
    return connection;
}

} // namespace welcomer::desktop
