// An LDAP directory as a source of users: searches a user's entry, and signs in to the directory as that user.

#pragma once

#include "tools/account-server/AccountSource.h"
#include "tools/account-server/LdapConnection.h"
#include "tools/account-server/Settings.h"

#include <chrono>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace welcomer::server {

class LdapSource final : public AccountSource {
  public:
    //  settings        with at least one server
    //  searchPassword  of who searches
    //  log             takes a line for each server that could not be asked; any thread
    LdapSource(LdapSettings settings, std::string searchPassword,
               std::function<void(const std::string&)> log);
    ~LdapSource() override;

    SourceAnswer authenticate(const std::string& user, const std::string& password) override;

    // The user's own entry has the note, where the settings have an attribute for it.
    SourceAnswer acceptTerms(const std::string& user, const std::string& password,
                             const PropertyList& terms) override;

  private:
    using Clock = std::chrono::steady_clock;

    // One to search with and one to be a user with, to the same server.
    struct Connections {
        LdapConnection searching;
        LdapConnection checking;
    };
    struct Server {
        std::string address;
        Clock::time_point avoidedUntil = {};
        std::vector<std::unique_ptr<Connections>> idle = {};
    };

    // What is asked.
    struct Question {
        const std::string& user;
        const std::string& password;
        const PropertyList* acceptedTerms; // null: who signs in
    };

    SourceAnswer _askServers(const Question& question);
    std::vector<Server*> _serversToAsk();
    std::unique_ptr<Connections> _connect(const Server& server) const;
    SourceAnswer _askServer(Server& server, const Question& question);
    SourceAnswer _ask(Connections& connections, const Question& question) const;
    void _accept(LdapConnection& user, const PropertyList& terms, SourceAnswer& answer) const;

    const LdapSettings _settings;
    std::string _searchPassword;
    const std::function<void(const std::string&)> _log;
    std::vector<std::string> _attributes;
    std::mutex _mutex; // of what changes in the servers
    std::vector<Server> _servers;
};

} // namespace welcomer::server
