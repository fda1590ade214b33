// A connection to one server of an LDAP directory, over libldap. Whatever the server does, no call takes much
// longer than the limit in the settings.

#pragma once

#include "tools/account-server/LdapMapping.h"
#include "tools/account-server/Settings.h"

#include <chrono>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

struct ldap;

namespace welcomer::server {

// The server cannot be asked: another one may. One line.
class LdapUnavailable : public std::runtime_error {
  public:
    using std::runtime_error::runtime_error;
};

// The server has not said anything for as long as the limit: asking it once more is for later.
class LdapSilent : public LdapUnavailable {
  public:
    using LdapUnavailable::LdapUnavailable;
};

// One thread at a time. After an LdapUnavailable it serves for nothing more.
class LdapConnection {
  public:
    // Connects, with StartTLS where the address begins with ldap://. Throws LdapUnavailable.
    LdapConnection(const LdapSettings& settings, const std::string& server);

    // Says who this is from now on.
    //  result  whether the password is right
    // Throws LdapUnavailable, and std::runtime_error where the server refuses for another reason.
    bool bind(const std::string& name, const std::string& password);

    struct Entry {
        std::string name; // the distinguished name
        LdapAttributes attributes;
    };

    // The entries that fit, two at most. Throws as above.
    std::vector<Entry> search(const std::string& filter, const std::vector<std::string>& attributes);

    // Has an attribute of an entry have this one value. Throws as above.
    void replace(const std::string& name, const std::string& attribute, const std::string& value);

  private:
    struct Close {
        void operator()(ldap* handle) const;
    };

    void _set(int option, const void* value);
    // asks  whether TLS is asked for first, and not spoken from the beginning
    void _useTls(bool asks);

    const LdapSettings& _settings;
    std::unique_ptr<ldap, Close> _handle;
};

} // namespace welcomer::server
