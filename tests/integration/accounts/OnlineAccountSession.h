// A session with the real daemons, and the account service on it through the real module.

#pragma once

#include "backends/desktop/DesktopModule.h"
#include "backends/desktop/accounts/OnlineAccountsModule.h"
#include "tests/contract/OnlineAccountBackend.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/support/DesktopSession.h"

#include <stdexcept>
#include <string>

namespace welcomer {

struct OnlineAccountSession {
    // The module's service.
    desktop::OnlineAccounts* onlineAccounts() {
        desktop::OnlineAccounts* const accounts = module.service();
        if (!accounts) {
            throw std::runtime_error("the module of the online accounts cannot be loaded");
        }
        return accounts;
    }

    TemporaryRoot folder;
    DesktopSession session{folder.path()};
    desktop::DesktopModule<desktop::OnlineAccountsModule> module{
        nullptr, {[this] {
            return posix::FileLock(posix::RootFolder(folder.path()), "/locks/online-accounts");
        }}};
};

// Everything runs.
struct RunningOnlineAccounts : OnlineAccountSession {
    RunningOnlineAccounts() {
        session.startBus();
        session.startKeyring();
        session.startOnlineAccounts();
    }
};

template <class Session, class Time>
struct OnlineAccountsOf : Session, contract::OnlineAccountBackend<Time> {
    OnlineAccountsOf() : contract::OnlineAccountBackend<Time>([this] { return Session::onlineAccounts(); }) {}
};

} // namespace welcomer
