// The accounts that the user has with the desktop, as the system sees them.

#pragma once

#include "backends/posix/SecretText.h"

#include <array>
#include <cstddef>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::desktop {

// What an online account can have switched on and off.
enum class OnlineFeature { Contacts, Calendar, Files, Mail };
inline constexpr std::size_t kOnlineFeatureCount = 4;

struct OnlineAccount {
    // A switch is stored only where the account's provider knows the feature; elsewhere it can be written and
    // read back, and nothing comes of it.
    struct Switch {
        bool isOff = false;
        bool hasInterface = false; // the feature is on and in effect

        // Whether the account has the feature: it is in effect, or somebody has switched it off.
        bool isKnown() const { return isOff || hasInterface; }
    };

    std::string path;         // of the account's object, by which it is known
    std::string providerType; // "owncloud", "imap_smtp"
    std::string identity;     // the user's name at the provider
    std::string presentationIdentity;
    std::array<Switch, kOnlineFeatureCount> switches;
    std::string mailAddress; // empty where mail is not in effect

    const Switch& switchOf(OnlineFeature feature) const {
        return switches[static_cast<std::size_t>(feature)];
    }
};

// An account to be made.
struct NewOnlineAccount {
    std::string providerType;
    std::string identity;
    posix::SecretText password;
    std::string serverAddress;                    // a URL
    std::array<bool, kOnlineFeatureCount> isOn{}; // the features that are switched on from the start
};

// The accounts of the user, and their switches. Any thread.
class OnlineAccounts {
  public:
    virtual ~OnlineAccounts() = default;

    // The accounts, those that were made first in front; none where nobody serves.
    virtual std::optional<std::vector<OnlineAccount>> list() = 0;

    // Switches a feature of an account on or off, and returns when that has taken effect: until then another
    // process cannot tell whether the switch has any. May block for some seconds.
    //  result  whether it has taken effect
    virtual bool setFeature(const OnlineAccount& account, OnlineFeature feature, bool isOn) = 0;

    // Makes an account, unless there is one of that provider with that identity, whichever process makes it
    // at the same time. May block for two minutes, while the user is asked to unlock the keyring that takes
    // the password.
    //  result  whether there is such an account now
    virtual bool makeOnce(const NewOnlineAccount& account) = 0;
};

} // namespace welcomer::desktop
