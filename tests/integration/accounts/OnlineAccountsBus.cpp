#include "tests/integration/accounts/OnlineAccountsBus.h"

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <stdexcept>
#include <thread>

namespace welcomer {

namespace {

using namespace std::chrono_literals;

constexpr char kAccountInterface[] = "org.gnome.OnlineAccounts.Account";
constexpr char kManagerPath[] = "/org/gnome/OnlineAccounts/Manager";
constexpr auto kTooLong = 60s;

std::string text(GVariant* value) {
    char* const printed = g_variant_print(value, FALSE);
    std::string result = printed;
    g_free(printed);
    return result;
}

} // namespace

OnlineAccountsBus::OnlineAccountsBus()
    : _bus(g_dbus_connection_new_for_address_sync(
          std::getenv("DBUS_SESSION_BUS_ADDRESS"),
          static_cast<GDBusConnectionFlags>(G_DBUS_CONNECTION_FLAGS_AUTHENTICATION_CLIENT |
                                            G_DBUS_CONNECTION_FLAGS_MESSAGE_BUS_CONNECTION),
          nullptr, nullptr, nullptr)) {
    if (!_bus) {
        throw std::runtime_error("the bus cannot be reached");
    }
}

OnlineAccountsBus::~OnlineAccountsBus() {
    g_object_unref(_bus);
}

std::vector<std::string> OnlineAccountsBus::accounts() {
    GVariant* const answer = _call("/org/gnome/OnlineAccounts", "org.freedesktop.DBus.ObjectManager",
                                   "GetManagedObjects", nullptr);
    GVariantIter* objects = nullptr;
    g_variant_get(answer, "(a{oa{sa{sv}}})", &objects);
    std::vector<std::string> paths;
    const char* path = nullptr;
    GVariant* interfaces = nullptr;
    while (g_variant_iter_loop(objects, "{&o@a{sa{sv}}}", &path, &interfaces)) {
        GVariant* const account = g_variant_lookup_value(interfaces, kAccountInterface, nullptr);
        if (account) {
            paths.emplace_back(path);
            g_variant_unref(account);
        }
    }
    g_variant_iter_free(objects);
    g_variant_unref(answer);
    std::sort(paths.begin(), paths.end());
    return paths;
}

std::string OnlineAccountsBus::property(const std::string& path, const std::string& name) {
    GVariant* const answer = _call(path, "org.freedesktop.DBus.Properties", "Get",
                                   g_variant_new("(ss)", kAccountInterface, name.c_str()));
    GVariant* value = nullptr;
    g_variant_get(answer, "(v)", &value);
    std::string result = text(value);
    g_variant_unref(value);
    g_variant_unref(answer);
    return result;
}

void OnlineAccountsBus::setProperty(const std::string& path, const std::string& name, bool value) {
    g_variant_unref(_call(path, "org.freedesktop.DBus.Properties", "Set",
                          g_variant_new("(ssv)", kAccountInterface, name.c_str(),
                                        g_variant_new_boolean(value ? TRUE : FALSE))));
}

bool OnlineAccountsBus::hasInterface(const std::string& path, const std::string& name) {
    GVariant* const answer = _call("/org/gnome/OnlineAccounts", "org.freedesktop.DBus.ObjectManager",
                                   "GetManagedObjects", nullptr);
    GVariant* const objects = g_variant_get_child_value(answer, 0);
    GVariant* const account = g_variant_lookup_value(objects, path.c_str(), nullptr);
    GVariant* const interface =
        account ? g_variant_lookup_value(account, ("org.gnome.OnlineAccounts." + name).c_str(), nullptr)
                : nullptr;
    const bool isThere = interface != nullptr;
    for (GVariant* value : {interface, account, objects, answer}) {
        if (value) {
            g_variant_unref(value);
        }
    }
    return isThere;
}

bool OnlineAccountsBus::waitForInterface(const std::string& path, const std::string& name, bool isThere) {
    const auto end = std::chrono::steady_clock::now() + kTooLong;
    while (hasInterface(path, name) != isThere) {
        if (std::chrono::steady_clock::now() > end) {
            return false;
        }
        std::this_thread::sleep_for(10ms);
    }
    return true;
}

std::string OnlineAccountsBus::addCloudAccount(const std::string& identity, bool isOn) {
    const std::string state = isOn ? "'true'" : "'false'";
    return _add(("('owncloud', '" + identity + "', '" + identity +
                 "@host', {'password': <'secret'>}, {'Uri': 'http://127.0.0.1:9/', 'CalendarEnabled': " +
                 state + ", 'ContactsEnabled': " + state + ", 'FilesEnabled': " + state + "})")
                    .c_str());
}

std::string OnlineAccountsBus::addMailAccount(const std::string& identity, const std::string& address,
                                              bool isOn) {
    return _add(("('imap_smtp', '" + identity + "', '" + address +
                 "', {'imap-password': <'secret'>, 'smtp-password': <'secret'>}, {'Enabled': '" +
                 (isOn ? "true" : "false") + "', 'EmailAddress': '" + address + "', 'Name': '" + identity +
                 "', 'ImapHost': '127.0.0.1:9', 'ImapUserName': '" + identity +
                 "', 'ImapUseSsl': 'false', 'ImapUseTls': 'false', 'SmtpHost': '127.0.0.1:9', "
                 "'SmtpUseAuth': 'false', 'SmtpUseSsl': 'false', 'SmtpUseTls': 'false'})")
                    .c_str());
}

void OnlineAccountsBus::remove(const std::string& path) {
    g_variant_unref(_call(path, kAccountInterface, "Remove", nullptr));
}

std::string OnlineAccountsBus::password(const std::string& path) {
    GVariant* const answer = _call(path, "org.gnome.OnlineAccounts.PasswordBased", "GetPassword",
                                   g_variant_new("(s)", "password"));
    const char* value = nullptr;
    g_variant_get(answer, "(&s)", &value);
    std::string result = value;
    g_variant_unref(answer);
    return result;
}

GVariant* OnlineAccountsBus::_call(const std::string& path, const char* interface, const char* method,
                                   GVariant* arguments) {
    GError* error = nullptr;
    GVariant* const answer =
        g_dbus_connection_call_sync(_bus, "org.gnome.OnlineAccounts", path.c_str(), interface, method,
                                    arguments, nullptr, G_DBUS_CALL_FLAGS_NONE, -1, nullptr, &error);
    if (!answer) {
        const std::string message = std::string(method) + ": " + error->message;
        g_error_free(error);
        throw std::runtime_error(message);
    }
    return answer;
}

std::string OnlineAccountsBus::_add(const char* arguments) {
    GVariant* const parsed =
        g_variant_parse(G_VARIANT_TYPE("(sssa{sv}a{ss})"), arguments, nullptr, nullptr, nullptr);
    if (!parsed) {
        throw std::runtime_error(std::string("cannot be read: ") + arguments);
    }
    GVariant* const answer = _call(kManagerPath, "org.gnome.OnlineAccounts.Manager", "AddAccount", parsed);
    g_variant_unref(parsed); // parsing gives a reference, which the call does not take
    const char* path = nullptr;
    g_variant_get(answer, "(&o)", &path);
    std::string result = path;
    g_variant_unref(answer);
    return result;
}

} // namespace welcomer
