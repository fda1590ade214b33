// The online accounts as another program sees and changes them: plain calls on the session bus.

#pragma once

#include <gio/gio.h>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

// Throws where a call fails.
class OnlineAccountsBus {
  public:
    OnlineAccountsBus();
    ~OnlineAccountsBus();
    OnlineAccountsBus(const OnlineAccountsBus&) = delete;
    OnlineAccountsBus& operator=(const OnlineAccountsBus&) = delete;

    // The paths of the accounts, in order.
    std::vector<std::string> accounts();

    // A property of an account in text: "'anna'", "true".
    std::string property(const std::string& path, const std::string& name);
    void setProperty(const std::string& path, const std::string& name, bool value);

    // Whether an account has an interface now ("Contacts"), and the wait until it has or has not.
    bool hasInterface(const std::string& path, const std::string& name);
    bool waitForInterface(const std::string& path, const std::string& name, bool isThere);

    // Makes accounts on a server of this machine that nobody runs.
    //  result  the path
    std::string addCloudAccount(const std::string& identity, bool isOn);
    std::string addMailAccount(const std::string& identity, const std::string& address, bool isOn);
    void remove(const std::string& path);

    std::string password(const std::string& path);

  private:
    GVariant* _call(const std::string& path, const char* interface, const char* method, GVariant* arguments);
    std::string _add(const char* text);

    GDBusConnection* const _bus;
};

} // namespace welcomer
