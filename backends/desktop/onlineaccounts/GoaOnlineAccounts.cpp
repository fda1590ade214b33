#include "backends/desktop/onlineaccounts/GoaOnlineAccounts.h"

#include "backends/desktop/BusName.h"

#include <algorithm>
#include <array>
#include <utility>

#define GOA_API_IS_SUBJECT_TO_CHANGE
#include <goa/goa.h>

namespace welcomer::desktop {

namespace {

constexpr char kBusName[] = "org.gnome.OnlineAccounts";
constexpr char kObjectManagerPath[] = "/org/gnome/OnlineAccounts";
constexpr char kManagerPath[] = "/org/gnome/OnlineAccounts/Manager";
constexpr char kManagerInterface[] = "org.gnome.OnlineAccounts.Manager";
constexpr char kAccountInterface[] = "org.gnome.OnlineAccounts.Account";

constexpr int kWriteMilliseconds = 25 * 1000;
constexpr int kMakeMilliseconds = 120 * 1000;
constexpr int kEffectMilliseconds = 10 * 1000;
constexpr gint64 kPatienceMicroseconds = gint64{10} * G_USEC_PER_SEC;

struct UnreferenceObject {
    void operator()(gpointer object) const { g_object_unref(object); }
};
template <typename T>
using ObjectPointer = std::unique_ptr<T, UnreferenceObject>;

struct Free {
    void operator()(gpointer memory) const { g_free(memory); }
};
using CString = std::unique_ptr<char, Free>;

struct UnreferenceVariant {
    void operator()(GVariant* variant) const { g_variant_unref(variant); }
};
using VariantPointer = std::unique_ptr<GVariant, UnreferenceVariant>;

// Where the library delivers what concerns the objects that are made meanwhile on this thread.
class PrivateMainContext {
  public:
    PrivateMainContext() { g_main_context_push_thread_default(_context); }
    ~PrivateMainContext() {
        while (g_main_context_iteration(_context, FALSE)) { // what the objects have left behind is freed
        }
        g_main_context_pop_thread_default(_context);
        g_main_context_unref(_context);
    }
    PrivateMainContext(const PrivateMainContext&) = delete;
    PrivateMainContext& operator=(const PrivateMainContext&) = delete;

    // Sleeps between deliveries until a condition holds, or the time is up.
    //  result  whether it holds
    template <typename Condition>
    bool waitFor(int milliseconds, Condition condition) const {
        bool isTimeUp = false;
        GSource* const timer = g_timeout_source_new(static_cast<guint>(milliseconds));
        g_source_set_callback(
            timer,
            [](gpointer flag) -> gboolean {
                *static_cast<bool*>(flag) = true;
                return G_SOURCE_REMOVE;
            },
            &isTimeUp, nullptr);
        g_source_attach(timer, _context);
        while (!condition() && !isTimeUp) {
            g_main_context_iteration(_context, TRUE);
        }
        g_source_destroy(timer);
        g_source_unref(timer);
        return condition();
    }

  private:
    GMainContext* const _context = g_main_context_new();
};

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

using ObjectManager = ObjectPointer<GDBusObjectManager>;

// What the daemon has, kept up to date while this thread's context is iterated; null where nobody has the
// daemon's name. Without a daemon the library gives an object all the same, an empty one.
ObjectManager lookAtDaemon(GDBusConnection* bus) {
    ObjectManager manager(goa_object_manager_client_new_sync(bus, G_DBUS_OBJECT_MANAGER_CLIENT_FLAGS_NONE,
                                                             kBusName, kObjectManagerPath, nullptr, nullptr));
    const CString owner(
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
    const CString owner(host);
    return !host || account.identity.find('@') != std::string::npos ? account.identity
                                                                    : account.identity + "@" + host;
}

} // namespace

GoaOnlineAccounts::Daemon GoaOnlineAccounts::look() {
    const Connection bus = _connection();
    const BusName name = bus ? lookAtBusName(bus.get(), kBusName, kReportMilliseconds) : BusName::Unknown;
    switch (name) {
    case BusName::Unknown:
        return Daemon::WithoutBus;
    case BusName::Nobody:
        return Daemon::Absent;
    case BusName::Startable:
        return Daemon::Startable;
    case BusName::Owned:
        break;
    }
    const VariantPointer answer(g_dbus_connection_call_sync(
        bus.get(), kBusName, kObjectManagerPath, "org.freedesktop.DBus.ObjectManager", "GetManagedObjects",
        nullptr, nullptr, G_DBUS_CALL_FLAGS_NO_AUTO_START, kReportMilliseconds, nullptr, nullptr));
    return answer ? Daemon::Answers : Daemon::Silent;
}

std::optional<std::vector<OnlineAccount>> GoaOnlineAccounts::list() {
    const Connection bus = _connection();
    if (!bus) {
        return std::nullopt;
    }
    const gint64 start = g_get_monotonic_time();
    const PrivateMainContext context;
    const ObjectManager manager = lookAtDaemon(bus.get());
    if (!manager) {
        _isGivenUp = _isGivenUp || g_get_monotonic_time() - start > kPatienceMicroseconds;
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
    const Connection bus = _connection();
    if (!bus) {
        return false;
    }
    const PrivateMainContext context;
    const ObjectManager manager = lookAtDaemon(bus.get());
    const VariantPointer answer(
        manager ? g_dbus_connection_call_sync(
                      bus.get(), kBusName, account.path.c_str(), "org.freedesktop.DBus.Properties", "Set",
                      g_variant_new("(ssv)", kAccountInterface, namesOf(feature).property,
                                    g_variant_new_boolean(!isOn)),
                      nullptr, G_DBUS_CALL_FLAGS_NO_AUTO_START, kWriteMilliseconds, nullptr, nullptr)
                : nullptr);
    // An account that has gone has no interface and gets none; so has one whose daemon has gone.
    return answer && context.waitFor(kEffectMilliseconds, [&] {
        return hasInterface(manager.get(), account.path, feature) == isOn;
    });
}

bool GoaOnlineAccounts::makeOnce(const NewOnlineAccount& account) {
    if (!canBeSent(account.identity) || !canBeSent(account.password)) {
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
    return isThere || _add(account);
}

bool GoaOnlineAccounts::_add(const NewOnlineAccount& account) {
    const Connection bus = _connection();
    if (!bus) {
        return false;
    }
    GVariantBuilder credentials;
    g_variant_builder_init(&credentials, G_VARIANT_TYPE_VARDICT);
    g_variant_builder_add(&credentials, "{sv}", "password", g_variant_new_string(account.password.c_str()));
    GVariantBuilder details;
    g_variant_builder_init(&details, G_VARIANT_TYPE("a{ss}"));
    g_variant_builder_add(&details, "{ss}", "Uri", account.serverAddress.c_str());
    g_variant_builder_add(&details, "{ss}", "AcceptSslErrors", "false");
    for (std::size_t i = 0; i < kOnlineFeatureCount; ++i) {
        g_variant_builder_add(&details, "{ss}", kFeatureNames[i].detail, account.isOn[i] ? "true" : "false");
    }
    const VariantPointer answer(g_dbus_connection_call_sync(
        bus.get(), kBusName, kManagerPath, kManagerInterface, "AddAccount",
        g_variant_new("(sssa{sv}a{ss})", account.providerType.c_str(), account.identity.c_str(),
                      presentation(account).c_str(), &credentials, &details),
        G_VARIANT_TYPE("(o)"), G_DBUS_CALL_FLAGS_NO_AUTO_START, kMakeMilliseconds, nullptr, nullptr));
    return answer != nullptr;
}

// A connection of our own leaves exit-on-close off and the process's shared connection alone.
GoaOnlineAccounts::Connection GoaOnlineAccounts::_connection() {
    const std::lock_guard lock(_mutex);
    if (_isGivenUp) {
        return nullptr;
    }
    if (!_bus || g_dbus_connection_is_closed(_bus.get())) {
        const CString address(g_dbus_address_get_for_bus_sync(G_BUS_TYPE_SESSION, nullptr, nullptr));
        _bus.reset(
            address ? g_dbus_connection_new_for_address_sync(
                          address.get(),
                          static_cast<GDBusConnectionFlags>(G_DBUS_CONNECTION_FLAGS_AUTHENTICATION_CLIENT |
                                                            G_DBUS_CONNECTION_FLAGS_MESSAGE_BUS_CONNECTION),
                          nullptr, nullptr, nullptr)
                    : nullptr);
    }
    return Connection(_bus ? static_cast<GDBusConnection*>(g_object_ref(_bus.get())) : nullptr);
}

} // namespace welcomer::desktop
