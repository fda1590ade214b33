#include "backends/local/accounts/LocalAccountDirectory.h"

#include "propertylist/Lookup.h"

#include <cerrno>

namespace welcomer::local {

std::vector<std::string> LocalAccountDirectory::accounts() {
    return _accountFile.names();
}

std::optional<std::vector<std::string>> LocalAccountDirectory::users() {
    return _replacement ? _replacement->userNames() : _machines.userNames();
}

platform::Outcome LocalAccountDirectory::addUser(const platform::CloudUser& user) {
    return _machines.writeUser(user, NimbusDirectory::IfThere::Fail);
}

platform::Outcome LocalAccountDirectory::storeUser(const platform::CloudUser& user) {
    return _machines.writeUser(user, NimbusDirectory::IfThere::Replace);
}

platform::Outcome LocalAccountDirectory::removeUser(const std::string& name) {
    return _machines.removeUser(name);
}

platform::Outcome LocalAccountDirectory::removeAccount(const std::string& name) {
    return _changeOrMiss("there is no account " + name, [&](PropertyList::Dictionary& content) {
        PropertyList::Dictionary* const accounts = dictionaryIn(content, kAccountsKey);
        if (!accounts || accounts->erase(name) == 0) {
            return false;
        }
        const std::string* const loggedIn = textIn(content, kLoggedInAccountKey);
        if (loggedIn && *loggedIn == name) {
            content.erase(kLoggedInAccountKey);
        }
        return true;
    });
}

platform::Outcome LocalAccountDirectory::signOut() {
    return _changeOrMiss("no account is logged in", [](PropertyList::Dictionary& content) {
        return content.erase(kLoggedInAccountKey) > 0;
    });
}

platform::Outcome
LocalAccountDirectory::_changeOrMiss(const std::string& missing,
                                     const std::function<bool(PropertyList::Dictionary&)>& change) {
    bool isThere = false;
    const platform::Outcome outcome = _accountFile.change([&](PropertyList::Dictionary& content) {
        isThere = change(content);
        return isThere;
    });
    return outcome && !isThere ? platform::Outcome::failure({ENOENT, missing}) : outcome;
}

} // namespace welcomer::local
