// Points the resolver at one of the cloud service's test environments, or back at production.

#pragma once

#include "platform/Observable.h"

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

// One override file per domain below /etc/resolver sends the queries for that domain to the nameserver of the
// chosen environment; no file there means production. Used by one thread at a time. Observers of
// "theCurrentServerName" are told of its changes.
class SwitchController : public platform::Observable {
  public:
    // What `selectedIndex` gives when no environment is selected: the largest signed 64-bit integer.
    static constexpr std::uint64_t kNotFoundIndex = INT64_MAX;

    // The one shared controller, made on first use, never destroyed. Any thread.
    static SwitchController& sharedController();

    // Finds out which environment the machine points to. Reads one file.
    SwitchController();

    // The environment the machine points to, or none when its configuration is not one of ours.
    std::optional<std::string> theCurrentServerName() const { return _theCurrentServerName; }

    // Whether the current name is "Prod"; not when there is none.
    bool isPointedToProd() const;

    // Whether this process may change the configuration: it runs as the superuser, and nobody has called
    // `setCanChangeConfiguration`.
    bool canChangeConfiguration() const;

    // Forbids changes for the life of this controller, whatever the argument.
    void setCanChangeConfiguration(bool ignored);

    // The names to choose from: "Prod", then the environments in the order of their characters. Made once.
    const std::vector<std::string>& availableServers();

    // The position of the current name among `availableServers`, or kNotFoundIndex.
    std::uint64_t selectedIndex();

    // Points the machine at the environment at this position of `availableServers`, unless it is the current
    // one. When that fails the reason is logged, the current name stays, and what was written or removed so
    // far stays too. Throws std::out_of_range for a position past the end. Changes files.
    void setSelectedIndex(std::uint64_t index);

    // Whether the chooser is shown: kept for the host.
    bool isVisible() const { return _isVisible; }
    void setIsVisible(bool isVisible) { _isVisible = isVisible; }

  protected:
    // Sets the current name from the override file of the last domain.
    void _readInitialConfiguration();

    // Removes every override and, for an environment, writes its own.
    //  result  whether the machine now points there; when not, the reason is logged
    bool _writeConfigForServer(const std::string& name);

  private:
    // The environment that an override file's text names, or none.
    std::optional<std::string> _serverInOverride(const std::string& text) const;
    bool _removeOverrides() const;
    bool _writeOverride(const std::string& domain, const std::string& nameserver) const;
    void _setTheCurrentServerName(const std::string& name);

    std::vector<std::string> _serverNames; // the cloud service's domains, in writing order
    std::map<std::string, std::string> _qaIPsByName;
    std::optional<std::vector<std::string>> _displayNames; // none until first asked
    std::optional<std::string> _theCurrentServerName;
    bool _toldOtherwise = false;
    bool _isVisible = false;
};

} // namespace welcomer
