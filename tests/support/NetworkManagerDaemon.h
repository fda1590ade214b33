// A NetworkManager and a system bus of a test's own.

#pragma once

#include <string>
#include <sys/types.h>
#include <vector>

namespace welcomer {

// The folder of the modules on NetworkManager. A process with mounts of its own does not always find it by
// where its program is: in a chroot that is the path outside.
inline constexpr char kNetworkModules[] = WELCOMER_NETWORK_MODULES;

// Takes over this process's network and mounts, which must be its own (enterNetworkNamespace,
// enterMountNamespace): /run, /sys and NetworkManager's folder below /var/lib are fresh, and a system bus
// runs. NetworkManager manages every link but those whose names begin with "p-", makes no profiles by itself,
// keeps out of the name servers and lets only the superuser change anything. Both end with this object or
// process. Main thread; throws when something cannot be had.
class NetworkManagerDaemon {
  public:
    //  portalURL  where it looks for captive portals; empty: nowhere
    explicit NetworkManagerDaemon(const std::string& portalURL = {});
    ~NetworkManagerDaemon();
    NetworkManagerDaemon(const NetworkManagerDaemon&) = delete;
    NetworkManagerDaemon& operator=(const NetworkManagerDaemon&) = delete;

    // Ends NetworkManager, or the bus, or holds NetworkManager up, or lets it go on.
    void stop();
    void stopBus();
    void hold(bool isHeld);

  private:
    pid_t _bus = -1;
    pid_t _manager = -1;
};

// A network namespace beside this process's own, with a program to keep it; it ends with this object.
class NeighbourNetwork {
  public:
    NeighbourNetwork();
    ~NeighbourNetwork();
    NeighbourNetwork(const NeighbourNetwork&) = delete;
    NeighbourNetwork& operator=(const NeighbourNetwork&) = delete;

    // Moves a link there.
    void take(const std::string& link) const;

    // The shell command that runs a simple command there.
    std::string command(const std::string& simple) const;

    // Runs a shell command there; throws when it fails.
    std::string shell(const std::string& text) const;

    // Starts a program there, which ends with this object, or with the result of this, its process's ID,
    // being given to stopProgram. A program that gives up rights would outlive this process.
    pid_t start(const std::string& text);

  private:
    pid_t _keeper = -1;
    std::vector<pid_t> _started;
};

// Starts a shell command that ends with this process.
pid_t startProgram(const std::string& command);
// Ends it now and waits for it.
void stopProgram(pid_t& process);

// Waits until a shell command succeeds; throws after a minute.
void waitFor(const std::string& command);

// Waits until NetworkManager could use a device, or does, or finds it without a cable.
void waitForManaged(const std::string& device);

} // namespace welcomer
