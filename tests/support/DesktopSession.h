// A desktop session of a test's own: a session bus and the real daemons on it.

#pragma once

#include <map>
#include <string>
#include <sys/types.h>
#include <vector>

namespace welcomer {

// The home folder, the runtime folder and every daemon are the test's. The environment of the process is
// changed for good, so there is one session in a process, made before anything asks for a folder or the bus.
// Nothing is started by the bus itself unless the test has said so. The daemons end with this object, and
// with the process.
class DesktopSession {
  public:
    // Starts nothing yet.
    //  folder  an empty folder for everything; borrowed
    explicit DesktopSession(std::string folder);
    ~DesktopSession();
    DesktopSession(const DesktopSession&) = delete;
    DesktopSession& operator=(const DesktopSession&) = delete;

    // The programs that a session needs and this machine does not have; empty when all are there.
    static std::vector<std::string> missingPrograms();

    // Each returns when the daemon serves, and throws when it does not come up.
    void startBus();
    void startKeyring(); // unlocked
    void startOnlineAccounts();

    // Has the bus start the daemon when somebody asks for it. Before the bus is started.
    void letBusStartOnlineAccounts();

    // Each kills the daemon, where it runs, and returns when it is gone.
    void killBus() { _kill("bus"); }
    void killKeyring() { _kill("keyring"); }
    void killOnlineAccounts() { _kill("online-accounts"); }

    // Stops the daemon of the online accounts, and has it go on.
    void freezeOnlineAccounts() const;
    void thawOnlineAccounts() const;

    const std::string& home() const { return _home; }

  private:
    void _start(const std::string& name, const std::vector<std::string>& command, const std::string& input);
    void _waitForName(const std::string& busName);
    void _kill(const std::string& name);

    const std::string _folder;
    const std::string _home;
    const std::string _runtime;
    std::map<std::string, pid_t> _daemons;
};

} // namespace welcomer
