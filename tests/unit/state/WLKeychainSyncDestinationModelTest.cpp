// Every combination of answers, against a model of its own: a script of what is to happen, ended by the first
// step that decides.

#include "generated/WelcomerConfiguration.h"
#include "state/WLKeychainSyncDestination.h"
#include "tests/unit/state/WLKeychainSyncDestinationFixture.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {
namespace {

struct Situation {
    HostAnswers answers;
    bool screenLock = false;
    bool reachable = false;
    bool checkOnly = false;
};

class Model {
  public:
    explicit Model(const Situation& situation) {
        const HostAnswers& host = situation.answers;
        if (_isDue(situation, host) && !situation.checkOnly) {
            _prepareKeychain(host);
        }
    }

    Lines calls; // with the log lines among them
    bool result = false;
    std::vector<std::int64_t> destinations;
    HostFlags flags;

  private:
    // Which rule skips? False where one does.
    bool _isDue(const Situation& situation, const HostAnswers& host) {
        _call("host.isMiniGreeter");
        _call(host.isMiniGreeter ? "PreferenceStore.copyValue com.corvid.screensaver, askForPassword"
                                 : "user.secureMyDesk");
        if (host.isMiniGreeter ? !situation.screenLock : !host.secureMyDesk) {
            return _skip("Keychain Sync was skipped because of screen lock setting.");
        }
        const std::string probed(configuration::kPublicWebHost);
        _call("host.networkingManager");
        _call("HostReachability.createTarget " + probed);
        _call("HostReachability.flags " + probed);
        if (!situation.reachable) {
            return _skip("Keychain Sync was skipped because the internet is not reachable.");
        }
        _call("cloud.creating");
        if (host.creating) {
            _call("cloud.hasCorvidProvidedID");
            if (!host.hasCorvidProvidedID) {
                return _skip("Keychain Sync was skipped because we are creating a new Nimbus account.");
            }
        }
        _call("host.isKeychainUpsellGreeter");
        if (!host.isKeychainUpsellGreeter) {
            _call("cloud.abortSetup");
            if (!host.abortSetup) {
                _call("cloud.mainAccountResponseDict");
            }
            if (host.abortSetup || !host.mainAccountResponseDict) {
                return _skip("Keychain Sync was skipped because Nimbus was skipped");
            }
        }
        result = true;
        return true;
    }

    void _prepareKeychain(const HostAnswers& host) {
        _call("host.isMiniGreeter");
        if (!host.isMiniGreeter) {
            _call("user.userName");
            _call("user.password");
            _call("helper.createKeychain local user, local password");
        }
        _call("cloud.username");
        _call("cloud.password");
        _call("cloud.mainAccountResponseDict");
        _call(std::string("helper.configure cloud user, cloud password, ") +
              (host.mainAccountResponseDict ? "{dsid = 1}" : "none"));
        _call("cloud.username");
        _call("cloud.password");
        _call("helper.seed cloud user, cloud password");
        if (!host.seedKeychainComponents) {
            _skip("Aborting Keychain Sync because components failed to initialize");
        } else {
            _findWay(host);
        }
    }

    void _findWay(const HostAnswers& host) {
        _call("cloud.abortSetup");
        if (host.abortSetupAfterSeeding) {
            return _end(3);
        }
        _call("helper.query none");
        _call("helper.isBackupEnabled");
        _set("cloud.setBackupIsEnabled", flags.backupIsEnabled, host.isBackupEnabled);
        const std::int64_t status = *host.keychainSyncStatus->at("status").integer();
        if (status != 0) {
            return _end(status == 1 ? 1 : 3);
        }
        _log("There is no existing circle, so we should recover if possible");
        _call("cloud.backupIsEnabled");
        if (!host.isBackupEnabled) {
            _log("Backup is NOT enabled, so we can't recover");
            return _end(0);
        }
        _log("Backup is enabled, so we should recover");
        _set("cloud.setIsBackupNoCircleRecovery", flags.isBackupNoCircleRecovery, true);
        _end(2);
    }

    void _call(const std::string& call) { calls.push_back(call); }
    void _log(const std::string& line) { calls.push_back("SystemLog.write 115, " + line); }
    void _set(const std::string& call, bool& flag, bool value) {
        calls.push_back(call + (value ? " 1" : " 0"));
        flag = value;
    }
    bool _skip(const std::string& line) {
        _log(line);
        _set("cloud.setAbortSyncSetup", flags.abortSyncSetup, true);
        _end(3);
        return false;
    }
    void _end(std::int64_t destination) {
        calls.push_back("callback " + std::to_string(destination));
        destinations.push_back(destination);
        result = destination != 3;
    }
};

// All situations, numbered.
class Situations {
  public:
    static constexpr std::uint32_t kFlags = 13;
    static constexpr std::uint32_t kStatuses = 5; // -1 to 3
    static constexpr std::uint32_t kCount = (1U << kFlags) * kStatuses;

    static Situation at(std::uint32_t number) {
        const std::int64_t status = static_cast<std::int64_t>(number % kStatuses) - 1;
        std::uint32_t bits = number / kStatuses;
        const auto next = [&bits] {
            const bool bit = bits & 1U;
            bits >>= 1U;
            return bit;
        };
        Situation situation;
        HostAnswers& host = situation.answers;
        for (bool* flag : {&host.isMiniGreeter, &host.secureMyDesk, &situation.screenLock,
                           &situation.reachable, &host.creating, &host.hasCorvidProvidedID,
                           &host.isKeychainUpsellGreeter, &host.abortSetup, &host.abortSetupAfterSeeding,
                           &host.seedKeychainComponents, &host.isBackupEnabled, &situation.checkOnly}) {
            *flag = next();
        }
        if (!next()) {
            host.mainAccountResponseDict = std::nullopt;
        }
        host.keychainSyncStatus = PropertyList::Dictionary{{"status", status}};
        return situation;
    }
};

TEST_F(WLKeychainSyncDestinationTest, EveryCombinationOfAnswersIsDecidedAsTheModelSays) {
    for (std::uint32_t number = 0; number < Situations::kCount; ++number) {
        const Situation situation = Situations::at(number);
        const Model model(situation);
        host.restart(situation.answers);
        setReachable(situation.reachable);
        setScreenLock(situation.screenLock);
        fake.recorder.clear();
        fake.systemLog.clear();
        destinations.clear();

        const bool result = _WLDetermineKeychainSyncDestination(
            host, situation.checkOnly, [this](WLKeychainSyncDestination destination) {
                fake.recorder.record("callback " + std::to_string(destination));
                destinations.push_back(destination);
            });

        ASSERT_EQ(result, model.result) << number;
        ASSERT_EQ(destinations, model.destinations) << number;
        ASSERT_EQ(host.flags, model.flags) << number;
        ASSERT_EQ(fake.recorder.calls(), model.calls) << number;
    }
}

} // namespace
} // namespace welcomer
