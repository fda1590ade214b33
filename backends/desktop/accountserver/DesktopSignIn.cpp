#include "backends/desktop/accountserver/DesktopSignIn.h"

#include "platform/AccountService.h"

#include <cstdlib>

namespace welcomer::desktop {

namespace {

platform::SignInAnswer noModule() {
    return {
        false,
        {{platform::kSKPropertyAccountError, platform::kSKAccountErrorServerUnavailable},
         {platform::kSKPropertyAccountErrorInfo,
          "the settings name an account server, but the module accountserver.so cannot be used: see welcomer "
          "doctor"}},
        0};
}

} // namespace

platform::SignInAnswer DesktopSignIn::answer(const std::string& username, const std::string& password,
                                             const PropertyList::Dictionary& delegateRequest) const {
    const auto* const directory = _directory();
    return directory ? directory->answer(username, password, delegateRequest) : noModule();
}

platform::SignInAnswer DesktopSignIn::acceptTerms(const std::string& username, const std::string& password,
                                                  const PropertyList& terms) const {
    const auto* const directory = _directory();
    return directory ? directory->acceptTerms(username, password, terms) : noModule();
}

PropertyList::Dictionary DesktopSignIn::servicesOfNewAccount(const std::string& username) const {
    const auto* const directory = _directory();
    return (directory ? *directory : _local).servicesOfNewAccount(username);
}

std::optional<std::vector<std::string>> DesktopSignIn::userNames() const {
    return _asksServer() ? std::nullopt : _local.userNames();
}

std::optional<platform::BackendReport> DesktopSignIn::report() {
    if (!_asksServer()) {
        return std::nullopt;
    }
    platform::BackendReport report{"SignInDirectory", server(), "", ""};
    _module.describe(report);
    return report;
}

void DesktopSignIn::stop() {
    if (AccountServer* const server = _module.madeService()) {
        server->stop();
    }
}

const platform::SignInDirectory* DesktopSignIn::_directory() const {
    return _asksServer() ? _module.service() : &_local;
}

std::string messagesLocale() {
    for (const char* const name : {"LC_ALL", "LC_MESSAGES", "LANG"}) {
        const char* const value = std::getenv(name);
        if (value && *value != '\0') {
            return value;
        }
    }
    return "";
}

} // namespace welcomer::desktop
