#include "tools/account-server/LdapSource.h"

#include "tools/account-server/LogLine.h"
#include "tools/account-server/WipedMemory.h"

#include <algorithm>
#include <ldap.h>
#include <utility>

namespace welcomer::server {

namespace {

using accountserver::Problem;
using accountserver::ProblemType;

// A server that could not be asked is asked after the others for so long.
constexpr std::chrono::seconds kAvoided{30};

SourceAnswer problem(ProblemType type, const std::string& detail = {}) {
    return {Problem{type, detail, {}, {}}, {}, {}};
}

} // namespace

LdapSource::LdapSource(LdapSettings settings, std::string searchPassword,
                       std::function<void(const std::string&)> log)
    : _settings(std::move(settings)),
      _searchPassword(std::move(searchPassword)),
      _log(std::move(log)) {
    for (const MappedMember& member : _settings.members) {
        if (!member.attribute.empty()) {
            _attributes.push_back(member.attribute);
        }
    }
    if (!_settings.termsAttribute.empty()) {
        _attributes.push_back(_settings.termsAttribute);
    }
    if (_attributes.empty()) {
        _attributes.emplace_back(LDAP_NO_ATTRS);
    }
    for (const std::string& address : _settings.servers) {
        _servers.push_back({address});
    }
}

LdapSource::~LdapSource() {
    const WipedAtEnd wiped(_searchPassword);
}

SourceAnswer LdapSource::authenticate(const std::string& user, const std::string& password) {
    return _askServers({user, password, nullptr});
}

SourceAnswer LdapSource::acceptTerms(const std::string& user, const std::string& password,
                                     const PropertyList& terms) {
    return _askServers({user, password, &terms});
}

SourceAnswer LdapSource::_askServers(const Question& question) {
    if (question.password.empty()) { // a directory may take it for nobody in particular, and let them in
        return problem(ProblemType::WrongPassword);
    }
    for (Server* const server : _serversToAsk()) {
        try {
            return _askServer(*server, question);
        } catch (const LdapUnavailable& error) {
            _log(LogLine("directory-unavailable")
                     .add("server", server->address)
                     .add("reason", error.what())
                     .text());
            const std::lock_guard lock(_mutex);
            server->avoidedUntil = Clock::now() + kAvoided;
            server->idle.clear();
        } catch (const std::runtime_error& error) {
            return problem(ProblemType::ServerError, error.what());
        }
    }
    return problem(ProblemType::Unavailable);
}

std::vector<LdapSource::Server*> LdapSource::_serversToAsk() {
    const Clock::time_point now = Clock::now();
    std::vector<Server*> servers;
    const std::lock_guard lock(_mutex);
    for (Server& server : _servers) {
        servers.push_back(&server);
    }
    std::stable_partition(servers.begin(), servers.end(),
                          [now](const Server* server) { return server->avoidedUntil <= now; });
    Server& first = *servers.front();
    if (first.avoidedUntil != Clock::time_point() && first.avoidedUntil <= now) {
        // This one tries whether it can be asked again: the others do not wait with it.
        first.avoidedUntil = now + kAvoided;
    }
    return servers;
}

std::unique_ptr<LdapSource::Connections> LdapSource::_connect(const Server& server) const {
    auto connections = std::make_unique<Connections>(
        Connections{LdapConnection(_settings, server.address), LdapConnection(_settings, server.address)});
    if (!_settings.searchName.empty() &&
        !connections->searching.bind(_settings.searchName, _searchPassword)) {
        throw LdapUnavailable("the password of LdapSearchName is wrong");
    }
    return connections;
}

SourceAnswer LdapSource::_askServer(Server& server, const Question& question) {
    std::unique_ptr<Connections> connections;
    {
        const std::lock_guard lock(_mutex);
        if (!server.idle.empty()) {
            connections = std::move(server.idle.back());
            server.idle.pop_back();
        }
    }
    const auto askAndKeep = [&] {
        SourceAnswer answer = _ask(*connections, question);
        const std::lock_guard lock(_mutex);
        server.avoidedUntil = {};
        server.idle.push_back(std::move(connections));
        return answer;
    };
    if (connections) {
        try {
            return askAndKeep();
        } catch (const LdapSilent&) {
            throw; // on a new connection it would be waited for once more
        } catch (const LdapUnavailable&) {
            // The server may have closed it while it was idle.
        }
    }
    connections = _connect(server);
    return askAndKeep();
}

SourceAnswer LdapSource::_ask(Connections& connections, const Question& question) const {
    const std::vector<LdapConnection::Entry> entries =
        connections.searching.search(filterFor(_settings.filter, question.user), _attributes);
    if (entries.size() > 1) {
        return problem(ProblemType::ServerError, "the directory has several entries of this name");
    }
    if (entries.empty()) {
        // As many steps as for a wrong password.
        connections.checking.bind(_settings.base.empty() ? "cn=nobody" : "cn=nobody," + _settings.base,
                                  question.password);
        return problem(ProblemType::UnknownUser);
    }
    const LdapConnection::Entry& entry = entries.front();
    if (!connections.checking.bind(entry.name, question.password)) {
        return {Problem{ProblemType::WrongPassword, {}, {}, {}}, entry.name, {}};
    }
    SourceAnswer answer{
        answerOf(question.user, entry.attributes, _settings.members, _settings.termsAttribute),
        entry.name,
        {}};
    if (question.acceptedTerms) {
        _accept(connections.checking, *question.acceptedTerms, answer);
    }
    return answer;
}

// Notes that the user has accepted the terms that the answer asks for, as that user.
void LdapSource::_accept(LdapConnection& user, const PropertyList& terms, SourceAnswer& answer) const {
    const auto* const found = std::get_if<Problem>(&answer.content);
    if (found && found->type != ProblemType::TermsOfService) {
        return;
    }
    if (_settings.termsAttribute.empty()) {
        answer.content = Problem{ProblemType::NotSupported, {}, {}, {}};
    } else if (found && found->errorInfo && *found->errorInfo != terms) {
        answer.content = Problem{ProblemType::OtherTerms, {}, {}, found->errorInfo};
    } else if (found && found->errorInfo) {
        user.replace(answer.identity, _settings.termsAttribute, noteOfTerms(terms));
        answer.content = accountserver::AuthenticateAnswer{};
    }
}

} // namespace welcomer::server
