// Switches a service of a cloud account and ends.
//   switch-service ROOT ACCOUNT SERVICE on|off

#include "backends/local/time/LocalDispatchQueues.h"
#include "backends/local/time/LocalRunLoops.h"
#include "tests/contract/TimeBackends.h"
#include "tests/integration/accounts/OnlineAccountSession.h"

int main(int argumentCount, char** arguments) {
    using namespace welcomer;
    if (argumentCount != 5) {
        return 2;
    }
    const posix::RootFolder root(arguments[1]);
    contract::LocalTime time;
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem(recorder);
    fakes::FakeProcessIdentity identity(recorder, fileSystem);
    fakes::FakePreferenceStore preferenceStore(recorder);
    fakes::FakeSystemLog log(recorder);
    local::LocalNotificationCenter center;
    desktop::DesktopModule<desktop::OnlineAccountsModule> module(nullptr, {[&] {
                                                                     return posix::FileLock(
                                                                         root, "/online-accounts/lock");
                                                                 }});
    desktop::OnlineAccountService service(
        {[&] { return module.service(); },
         [&](platform::NotificationCenter& posts) {
             return std::make_unique<local::LocalAccountService>(root, identity, time.runLoops,
                                                                 time.dispatchQueues, posts, log);
         },
         preferenceStore, time.runLoops, time.dispatchQueues, center},
        [] {
            return desktop::OnlineAccountServer{"owncloud", "http://127.0.0.1:9/"};
        });
    const bool isOn = std::string(arguments[4]) == "on";
    const auto account = service.accountForID(arguments[2], true);
    const auto entry = account ? account->serviceForID(arguments[3]) : nullptr;
    if (!entry) {
        return 1;
    }
    entry->enableSilently(isOn);
    return service.isServiceEnabled(account.get(), arguments[3]) == isOn ? 0 : 1;
}
