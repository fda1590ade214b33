#include "tools/account-server/LdapConnection.h"

#include "propertylist/Characters.h"
#include "tools/account-server/LdapSocket.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <ldap.h>
#include <openldap.h> // ldap_init_fd
#include <string_view>
#include <sys/time.h>
#include <system_error>
#include <utility>

namespace welcomer::server {

namespace {

constexpr char kSystemsAuthorities[] = "/etc/ssl/certs/ca-certificates.crt";
constexpr char kLocalSocket[] = "/run/slapd/ldapi";
constexpr int kMostEntries = 2; // more than one is too many already

struct FreeMessage {
    void operator()(LDAPMessage* message) const { ldap_msgfree(message); }
};
using Message = std::unique_ptr<LDAPMessage, FreeMessage>;

std::string lowerCase(std::string_view text) {
    std::string lower(text);
    std::ranges::transform(lower, lower.begin(), toLower);
    return lower;
}

// Whether a server that answers so is one to ask something else instead of another one.
[[noreturn]] void fail(int code) {
    const char* const why = ldap_err2string(code);
    switch (code) {
    case LDAP_TIMEOUT:
        throw LdapSilent(why);
    case LDAP_BUSY:
    case LDAP_UNAVAILABLE:
    case LDAP_TIMELIMIT_EXCEEDED:
    case LDAP_ADMINLIMIT_EXCEEDED:
        throw LdapUnavailable(why);
    default:
        break;
    }
    if (code < 0) { // libldap's own: the connection, a time that is over
        throw LdapUnavailable(why);
    }
    throw std::runtime_error(std::string("the directory refuses: ") + why);
}

void check(int code) {
    if (code != LDAP_SUCCESS) {
        fail(code);
    }
}

timeval limitOf(const LdapSettings& settings) {
    return {static_cast<time_t>(settings.limit.count()), 0};
}

// Waits for all that a request is answered.
//  code  receives what the server says of it
Message await(ldap* handle, int request, const LdapSettings& settings, int& code) {
    timeval limit = limitOf(settings);
    LDAPMessage* found = nullptr;
    const int kind = ldap_result(handle, request, LDAP_MSG_ALL, &limit, &found);
    Message message(found);
    if (kind <= 0) {
        fail(kind == 0 ? LDAP_TIMEOUT : LDAP_SERVER_DOWN);
    }
    check(ldap_parse_result(handle, message.get(), &code, nullptr, nullptr, nullptr, nullptr, 0));
    return message;
}

LdapAttributes attributesOf(ldap* handle, LDAPMessage* entry) {
    LdapAttributes attributes;
    BerElement* position = nullptr;
    for (char* name = ldap_first_attribute(handle, entry, &position); name;
         name = ldap_next_attribute(handle, entry, position)) {
        std::vector<std::string>& values = attributes[lowerCase(name)];
        berval** const found = ldap_get_values_len(handle, entry, name);
        for (int i = 0; found && found[i]; ++i) {
            values.emplace_back(found[i]->bv_val, found[i]->bv_len);
        }
        ldap_value_free_len(found);
        ldap_memfree(name);
    }
    ber_free(position, 0);
    return attributes;
}

} // namespace

void LdapConnection::Close::operator()(ldap* handle) const {
    ldap_unbind_ext_s(handle, nullptr, nullptr);
}

LdapConnection::LdapConnection(const LdapSettings& settings, const std::string& server)
    : _settings(settings) {
    LDAPURLDesc* parts = nullptr;
    if (ldap_url_parse(server.c_str(), &parts) != LDAP_URL_SUCCESS) {
        throw LdapUnavailable("this is no address of a directory");
    }
    const std::unique_ptr<LDAPURLDesc, decltype(&ldap_free_urldesc)> address(parts, &ldap_free_urldesc);
    const bool isLocal = std::string_view(address->lud_scheme) == "ldapi";
    const std::string host = address->lud_host ? address->lud_host : "";
    const bool hasName = !host.empty();
    posix::FileDescriptor socket = connectWithin(hasName   ? host
                                                 : isLocal ? kLocalSocket
                                                           : "localhost",
                                                 address->lud_port, settings.limit);
    if (!socket) {
        throw LdapUnavailable(std::generic_category().message(errno));
    }
    ldap* handle = nullptr;
    check(ldap_init_fd(socket.get(), isLocal ? LDAP_PROTO_IPC : LDAP_PROTO_TCP, server.c_str(), &handle));
    _handle.reset(handle);
    const int number = socket.release();
    const int version = LDAP_VERSION3;
    const timeval limit = limitOf(settings);
    _set(LDAP_OPT_PROTOCOL_VERSION, &version);
    _set(LDAP_OPT_TIMEOUT, &limit);
    _set(LDAP_OPT_REFERRALS, LDAP_OPT_OFF); // passwords go nowhere but to the servers in the settings
    if (!isLocal) {
        const BrokenOffAfter watch(number, settings.limit);
        _useTls(std::string_view(address->lud_scheme) == "ldap");
    }
}

void LdapConnection::_set(int option, const void* value) {
    if (ldap_set_option(_handle.get(), option, value) != LDAP_OPT_SUCCESS) {
        throw LdapUnavailable("libldap does not take the option " + std::to_string(option));
    }
}

void LdapConnection::_useTls(bool asks) {
    const int demand = LDAP_OPT_X_TLS_DEMAND;
    const int oldest = LDAP_OPT_X_TLS_PROTOCOL_TLS1_2;
    const int isServer = 0;
    _set(LDAP_OPT_X_TLS_REQUIRE_CERT, &demand);
    _set(LDAP_OPT_X_TLS_CACERTFILE,
         _settings.authority.empty() ? kSystemsAuthorities : _settings.authority.c_str());
    _set(LDAP_OPT_X_TLS_PROTOCOL_MIN, &oldest);
    _set(LDAP_OPT_X_TLS_NEWCTX, &isServer); // takes over what was set before
    check(asks ? ldap_start_tls_s(_handle.get(), nullptr, nullptr) : ldap_install_tls(_handle.get()));
}

bool LdapConnection::bind(const std::string& name, const std::string& password) {
    // libldap's structure takes memory that can be written; it does not write.
    berval secret{password.size(), const_cast<char*>(password.data())};
    int request = 0;
    check(ldap_sasl_bind(_handle.get(), name.c_str(), LDAP_SASL_SIMPLE, &secret, nullptr, nullptr, &request));
    int code = 0;
    await(_handle.get(), request, _settings, code);
    switch (code) {
    case LDAP_SUCCESS:
        return true;
    case LDAP_INVALID_CREDENTIALS:
    case LDAP_INAPPROPRIATE_AUTH:
    case LDAP_NO_SUCH_OBJECT:
        return false;
    default:
        fail(code);
    }
}

std::vector<LdapConnection::Entry> LdapConnection::search(const std::string& filter,
                                                          const std::vector<std::string>& attributes) {
    std::vector<char*> names;
    names.reserve(attributes.size() + 1);
    for (const std::string& attribute : attributes) {
        names.push_back(const_cast<char*>(attribute.c_str()));
    }
    names.push_back(nullptr);
    timeval limit = limitOf(_settings);
    int request = 0;
    check(ldap_search_ext(_handle.get(), _settings.base.c_str(), LDAP_SCOPE_SUBTREE, filter.c_str(),
                          names.data(), 0, nullptr, nullptr, &limit, kMostEntries, &request));
    int code = 0;
    const Message message = await(_handle.get(), request, _settings, code);
    if (code != LDAP_SIZELIMIT_EXCEEDED && code != LDAP_NO_SUCH_OBJECT) {
        check(code);
    }
    std::vector<Entry> entries;
    for (LDAPMessage* entry = ldap_first_entry(_handle.get(), message.get()); entry;
         entry = ldap_next_entry(_handle.get(), entry)) {
        char* const name = ldap_get_dn(_handle.get(), entry);
        entries.push_back({name ? name : "", attributesOf(_handle.get(), entry)});
        ldap_memfree(name);
    }
    return entries;
}

void LdapConnection::replace(const std::string& name, const std::string& attribute,
                             const std::string& value) {
    // As above, libldap does not write what it takes.
    berval written{value.size(), const_cast<char*>(value.data())};
    std::array<berval*, 2> values{&written, nullptr};
    LDAPMod change{};
    change.mod_op = LDAP_MOD_REPLACE | LDAP_MOD_BVALUES;
    change.mod_type = const_cast<char*>(attribute.c_str());
    change.mod_bvalues = values.data();
    std::array<LDAPMod*, 2> changes{&change, nullptr};
    int request = 0;
    check(ldap_modify_ext(_handle.get(), name.c_str(), changes.data(), nullptr, nullptr, &request));
    int code = 0;
    await(_handle.get(), request, _settings, code);
    check(code);
}

} // namespace welcomer::server
