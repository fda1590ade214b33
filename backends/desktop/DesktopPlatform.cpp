#include "backends/desktop/DesktopPlatform.h"

#include "backends/desktop/SessionBusTrace.h"
#include "backends/local/accounts/LocalAccountService.h"
#include "backends/posix/FileLock.h"
#include "backends/posix/RootFolder.h"

#include <chrono>
#include <memory>

namespace welcomer::desktop {

namespace {

constexpr char kOnlineAccountsLock[] = "OnlineAccounts";

// What the local platform stands on, where the program has chosen nothing else.
PlatformOptions standingOn(PlatformOptions options, platform::RunLoops& runLoops,
                           platform::SignInDirectory& signIn) {
    if (!options.runLoops) {
        options.runLoops = &runLoops;
    }
    if (!options.signInDirectory) {
        options.signInDirectory = &signIn;
    }
    return options;
}

SearchListCredentialStore::NewItems newItemsOf(const PlatformOptions& options) {
    return options.storesCredentialsLocally ? SearchListCredentialStore::NewItems::ToTheLocalStore
                                            : SearchListCredentialStore::NewItems::ToTheService;
}

// The local platform with the desktop's services in their places.
platform::Platform withDesktop(const platform::Platform& local, platform::CredentialStore& credentialStore,
                               platform::PreferenceStore& preferenceStore,
                               platform::AccountService& accountService, DesktopNetwork& network,
                               platform::HostReachability& hostReachability) {
    return {.systemLog = local.systemLog,
            .fileSystem = local.fileSystem,
            .processIdentity = local.processIdentity,
            .credentialStore = credentialStore,
            .pluginBundle = local.pluginBundle,
            .resourceBundles = local.resourceBundles,
            .clock = local.clock,
            .runLoops = local.runLoops,
            .dispatchQueues = local.dispatchQueues,
            .preferenceStore = preferenceStore,
            .systemVersionInfo = local.systemVersionInfo,
            .hostReachability = hostReachability,
            .notificationCenter = local.notificationCenter,
            .accountService = accountService,
            .processLauncher = local.processLauncher,
            .networkConfigStore = network.configStore(),
            .networkStateStore = network.stateStore(),
            .directoryService = local.directoryService};
}

} // namespace

DesktopPlatform::DesktopPlatform(const PlatformOptions& options)
    : _modules{options.systemLog ? options.systemLog : &_systemLog},
      _runLoops(_modules),
      _nimbusDirectory(posix::RootFolder(options.root)),
      _signIn(_nimbusDirectory, _accountServerArguments(), _modules),
      _local(standingOn(options, _runLoops, _signIn)),
      _credentialStore(posix::RootFolder(options.root), _local.platform().processIdentity,
                       _local.platform().credentialStore, {}, newItemsOf(options), _modules),
      _onlineAccounts(
          nullptr, {[root = posix::RootFolder(options.root), &identity = _local.platform().processIdentity] {
              const std::vector<std::string> libraries = identity.userLibraryDirectories();
              return libraries.empty()
                         ? posix::FileLock()
                         : posix::FileLock(root, posix::userLockPath(libraries.front(), kOnlineAccountsLock));
          }},
          _modules),
      _accountService(_accountSurroundings(options.root),
                      [this] {
                          return OnlineAccountServer{_local.setting(local::Setting::OnlineAccountProvider),
                                                     _local.setting(local::Setting::OnlineAccountServer)};
                      }),
      _preferenceStore(_local.platform().preferenceStore, _modules),
      _nameServers(_modules),
      _kernelConfigStore(posix::RootFolder(options.root), &_nameServers),
      _network({_kernelConfigStore, _local.platform().networkStateStore, _local.platform().hostReachability},
               _modules),
      _platform(withDesktop(
          _local.platform(), _credentialStore.store(), _preferenceStore, _accountService, _network,
          options.hostReachability ? *options.hostReachability : _network.hostReachability())) {}

std::vector<platform::BackendReport> DesktopPlatform::backendReports() {
    std::vector<platform::BackendReport> reports;
    reports.push_back(_credentialStore.report());
    reports.push_back(_preferenceStore.report());
    reports.push_back(_runLoops.report());
    platform::BackendReport accounts{"AccountService", "account file", "", ""};
    _onlineAccounts.describe(accounts);
    reports.push_back(accounts);
    if (const auto server = _signIn.report()) {
        reports.push_back(*server);
    }
    const std::vector<platform::BackendReport> network = _network.reports();
    reports.insert(reports.end(), network.begin(), network.end());
    return reports;
}

AccountServerModule::Arguments DesktopPlatform::_accountServerArguments() {
    const auto seconds = [this](local::Setting setting) {
        return std::chrono::seconds(std::stoi(_local.setting(setting))); // a number, or it would not be there
    };
    return {[this, seconds] {
                return AccountServerSettings{_local.setting(local::Setting::AccountServer),
                                             _local.setting(local::Setting::AccountServerAuthority),
                                             _local.setting(local::Setting::AccountServerRevocations),
                                             seconds(local::Setting::AccountServerConnectSeconds),
                                             seconds(local::Setting::AccountServerSeconds)};
            },
            [this] {
                return accountserver::Machine{
                    _local.productName().value_or(""),
                    _local.platform().systemVersionInfo.productVersion().value_or(""), messagesLocale()};
            }};
}

OnlineAccountSurroundings DesktopPlatform::_accountSurroundings(const std::string& root) {
    const platform::Platform& local = _local.platform();
    return {[this] { return mayHaveSessionBus() ? _onlineAccounts.service() : nullptr; },
            [root, &local, &directory = _local.signInDirectory()](platform::NotificationCenter& posts) {
                return std::make_unique<local::LocalAccountService>(
                    posix::RootFolder(root), local.processIdentity, local.runLoops, local.dispatchQueues,
                    posts, local.systemLog, &directory);
            },
            local.preferenceStore,
            local.runLoops,
            local.dispatchQueues,
            local.notificationCenter};
}

} // namespace welcomer::desktop
