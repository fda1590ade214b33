// A hosting setup application whose answers come from a property list.

#pragma once

#include "state/SetupStateManager.h"

#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::tool {

// A scenario is a dictionary with the answers of the host's operations under their names:
//
//     isMiniGreeter, isKeychainUpsellGreeter
//     localUserAccountManager = { secureMyDesk, userName, password }
//     NimbusManager = { creating, hasCorvidProvidedID, abortSetup, mainAccountResponseDict, username,
//     password } wlloginhelper = { seedKeychainComponents, queryKeychainSyncStatus, isBackupEnabled,
//                       escrowUsesComplexPasscode }
//
// and three more: `abortSetupAfterSeeding` in NimbusManager takes the place of `abortSetup` once the
// components were seeded; `internetIsReachable` and `screenLockRequiresPassword` take the place of this
// machine's answers. Any other answer that is left out is false or none. Booleans may also be numbers or
// texts such as YES.
class ScenarioHost final : public SetupStateManager {
  public:
    // Throws CommandFailure for what is no dictionary, a name that means nothing and an answer of a wrong
    // type.
    explicit ScenarioHost(const PropertyList& scenario);
    ~ScenarioHost() override;

    // None: to be asked of this machine.
    std::optional<bool> internetIsReachable() const;
    std::optional<bool> screenLockRequiresPassword() const;

    // The operations that were called, in order, with their arguments and answers but without passwords and
    // responses.
    const std::vector<std::string>& calls() const { return _calls; }

    // The cloud setup manager's flags.
    struct Flags {
        bool backupIsEnabled = false;
        bool isBackupNoCircleRecovery = false;
        bool abortSyncSetup = false;
    };
    const Flags& flags() const { return _flags; }

    bool isMiniGreeter() override;
    bool isKeychainUpsellGreeter() override;
    LocalUserAccountManager& localUserAccountManager() override;
    NetworkingManager& networkingManager() override;
    CloudSetupManager& NimbusManager() override;
    WLLoginHelper& wlloginhelper() override;

  private:
    class User;
    class Cloud;
    class Helper;

    // The answer under a name of the scenario or of one of its parts, an empty part name being the scenario.
    const PropertyList* _find(const char* part, const char* name) const;
    std::optional<std::string> _text(const char* part, const char* name) const;
    std::optional<PropertyList::Dictionary> _dictionary(const char* part, const char* name) const;
    bool _flag(const char* part, const char* name) const;

    // Answers a question, and keeps it as a call.
    bool _answer(const char* part, const char* name);

    PropertyList::Dictionary _scenario;
    std::vector<std::string> _calls;
    Flags _flags;
    bool _hasSeeded = false;
    std::optional<NetworkingManager> _network; // reads the network when it is first asked for
    std::unique_ptr<User> _user;
    std::unique_ptr<Cloud> _cloud;
    std::unique_ptr<Helper> _helper;
};

} // namespace welcomer::tool
