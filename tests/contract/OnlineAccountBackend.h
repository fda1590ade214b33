// The account service on online accounts, for the suites: the embedded one below a root of its own, and the
// online accounts of the suite's choice.

#pragma once

#include "backends/desktop/accounts/OnlineAccountService.h"
#include "tests/contract/LocalAccounts.h"
#include "tests/fakes/FakePreferenceStore.h"

#include <functional>
#include <memory>
#include <utility>

namespace welcomer::contract {

template <typename Time>
struct OnlineAccountBackend {
    explicit OnlineAccountBackend(std::function<desktop::OnlineAccounts*()> onlineAccounts,
                                  desktop::OnlineAccountServer server = {"owncloud", "http://127.0.0.1:9/"})
        : online(std::move(onlineAccounts)),
          cloud(std::move(server)) {}

    void addUser(const std::string& name, const std::string& password) { embedded.addUser(name, password); }

    // Another service on the same accounts, as another process would have.
    std::unique_ptr<desktop::OnlineAccountService> makeService() {
        return std::make_unique<desktop::OnlineAccountService>(
            desktop::OnlineAccountSurroundings{online,
                                               [this](platform::NotificationCenter& posts) {
                                                   return std::make_unique<local::LocalAccountService>(
                                                       posix::RootFolder(embedded.root.path()),
                                                       embedded.identity, time.runLoops, time.dispatchQueues,
                                                       posts, embedded.log);
                                               },
                                               preferenceStore, time.runLoops, time.dispatchQueues, center},
            [server = cloud] { return server; });
    }

    const std::function<desktop::OnlineAccounts*()> online;
    const desktop::OnlineAccountServer cloud;
    LocalAccounts<Time> embedded;
    Time& time = embedded.time;
    local::LocalNotificationCenter& center = embedded.center;
    fakes::FakePreferenceStore preferenceStore{embedded.recorder};
    const std::unique_ptr<desktop::OnlineAccountService> owner = makeService();
    desktop::OnlineAccountService& service = *owner;
};

} // namespace welcomer::contract
