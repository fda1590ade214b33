// Users in memory, and the accounts of the fake account service.

#pragma once

#include "platform/AccountDirectory.h"
#include "tests/fakes/FakeAccountService.h"

#include <cerrno>
#include <map>
#include <string>

namespace welcomer::fakes {

class FakeAccountDirectory final : public platform::AccountDirectory {
  public:
    explicit FakeAccountDirectory(FakeAccountService& service) : _service(service) {}

    // Who can sign in, by name. Set between the calls.
    std::map<std::string, platform::CloudUser> cloudUsers;

    std::vector<std::string> accounts() override { return _names(_service.accounts); }
    std::optional<std::vector<std::string>> users() override { return _names(cloudUsers); }
    platform::Outcome addUser(const platform::CloudUser& user) override {
        return cloudUsers.try_emplace(user.name, user).second
                   ? platform::Outcome::success()
                   : platform::Outcome::failure({EEXIST, "the user " + user.name + " exists already"});
    }
    platform::Outcome storeUser(const platform::CloudUser& user) override {
        cloudUsers.insert_or_assign(user.name, user);
        return platform::Outcome::success();
    }

    platform::Outcome removeUser(const std::string& name) override {
        return _outcome(cloudUsers.erase(name) > 0, "there is no user " + name);
    }
    platform::Outcome removeAccount(const std::string& name) override {
        if (_service.loggedIn == name) {
            _service.loggedIn.reset();
        }
        return _outcome(_service.accounts.erase(name) > 0, "there is no account " + name);
    }
    platform::Outcome signOut() override {
        const bool isThere = _service.loggedIn.has_value();
        _service.loggedIn.reset();
        return _outcome(isThere, "no account is logged in");
    }

  private:
    static platform::Outcome _outcome(bool isThere, const std::string& missing) {
        return isThere ? platform::Outcome::success() : platform::Outcome::failure({ENOENT, missing});
    }
    template <typename Map>
    static std::vector<std::string> _names(const Map& map) {
        std::vector<std::string> names;
        for (const auto& entry : map) {
            names.push_back(entry.first);
        }
        return names;
    }

    FakeAccountService& _service;
};

} // namespace welcomer::fakes
