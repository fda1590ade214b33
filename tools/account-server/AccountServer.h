// The server: its sockets, its settings, and the one thread on which everything but the checking of passwords
// happens.

#pragma once

#include "backends/posix/FileDescriptor.h"
#include "backends/posix/RootFolder.h"
#include "platform/SystemLog.h"
#include "tools/account-server/AccountHandler.h"
#include "tools/account-server/AccountSource.h"
#include "tools/account-server/ListeningSockets.h"
#include "tools/account-server/Metrics.h"
#include "tools/account-server/Settings.h"
#include "tools/account-server/Timers.h"

#include <functional>
#include <list>
#include <memory>
#include <string>
#include <vector>

namespace welcomer::server {

class AccountServer {
  public:
    // Makes the source that the settings ask for. Throws std::runtime_error with one line when it cannot be made.
    using MakeSource = std::function<std::unique_ptr<AccountSource>(const Settings&)>;

    // Reads the settings and serves the sockets from then on. Throws std::runtime_error with one line when
    // something of that fails. SIGTERM, SIGINT and SIGHUP are this object's from now on, in all threads that
    // are made afterwards.
    //  root  below which the settings and what they name lie
    //  log   takes the lines; borrowed
    AccountServer(std::vector<ListeningSocket> sockets, posix::RootFolder root, MakeSource makeSource,
                  platform::SystemLog& log);
    ~AccountServer();
    AccountServer(const AccountServer&) = delete;
    AccountServer& operator=(const AccountServer&) = delete;

    // Serves until it is told to end, and what was under way then has had its answer.
    void run();

  private:
    struct Generation;

    std::unique_ptr<Generation> _start();
    void _reload();
    void _stop();
    void _takeSignals();
    void _wait();
    void _runListeners();
    void _log(int severity, const std::string& line) const;

    const std::vector<ListeningSocket> _sockets;
    const posix::RootFolder _root;
    const MakeSource _makeSource;
    platform::SystemLog& _systemLog;
    const posix::FileDescriptor _signals;
    const posix::FileDescriptor _wakeUp; // written to by worker threads

    Metrics _metrics;
    RequestHistory _history;
    Timers _timers;
    Timers::Timer _breakOff{_timers};
    bool _stops = false;
    // What is served with one reading of the settings: the newest one last, the others until their connections
    // have ended.
    std::list<std::unique_ptr<Generation>> _generations;
};

} // namespace welcomer::server
