// A hosting setup application whose answers tests choose.

#pragma once

#include "state/SetupStateManager.h"
#include "tests/fakes/CallRecorder.h"
#include "text/Describe.h"

#include <optional>
#include <string>

namespace welcomer {

// What the host's operations of the same names answer.
struct HostAnswers {
    bool isMiniGreeter = false;
    bool isKeychainUpsellGreeter = false;
    bool secureMyDesk = true;
    bool creating = false;
    bool hasCorvidProvidedID = false;
    bool abortSetup = false;
    bool abortSetupAfterSeeding = false; // takes the place of the former once components were seeded
    std::optional<PropertyList::Dictionary> mainAccountResponseDict = PropertyList::Dictionary{{"dsid", 1}};
    std::string username = "cloud user";
    std::string usernameAfterConfiguring = "cloud user";
    bool seedKeychainComponents = true;
    std::optional<PropertyList::Dictionary> keychainSyncStatus = PropertyList::Dictionary{{"status", 1}};
    bool isBackupEnabled = false; // of the helper
    bool escrowUsesComplexPasscode = false;
};

// What the decision sets.
struct HostFlags {
    bool backupIsEnabled = false;
    bool isBackupNoCircleRecovery = false;
    bool abortSyncSetup = false;
    friend bool operator==(const HostFlags&, const HostFlags&) = default;
};

// Every operation is recorded in order, as "host.isMiniGreeter", "user.secureMyDesk",
// "cloud.setAbortSyncSetup 1", "helper.createKeychain local user, local password".
class SetupHost final : public SetupStateManager {
  public:
    explicit SetupHost(fakes::CallRecorder& recorder) : _recorder(recorder) {}

    HostAnswers answers;
    HostFlags flags;

    // Begins anew with other answers.
    void restart(const HostAnswers& newAnswers) {
        answers = newAnswers;
        flags = {};
        _hasConfigured = false;
        _hasSeeded = false;
    }

    bool isMiniGreeter() override { return _answer("host.isMiniGreeter", answers.isMiniGreeter); }
    bool isKeychainUpsellGreeter() override {
        return _answer("host.isKeychainUpsellGreeter", answers.isKeychainUpsellGreeter);
    }
    LocalUserAccountManager& localUserAccountManager() override { return _user; }
    NetworkingManager& networkingManager() override {
        _recorder.record("host.networkingManager");
        return _network;
    }
    CloudSetupManager& NimbusManager() override { return _cloud; }
    WLLoginHelper& wlloginhelper() override { return _helper; }

  private:
    using Text = std::optional<std::string>;
    using Dictionary = std::optional<PropertyList::Dictionary>;

    struct User final : LocalUserAccountManager {
        explicit User(SetupHost& itsHost) : host(itsHost) {}
        bool secureMyDesk() override { return host._answer("user.secureMyDesk", host.answers.secureMyDesk); }
        Text userName() override { return host._answer("user.userName", Text("local user")); }
        Text password() override { return host._answer("user.password", Text("local password")); }
        SetupHost& host;
    };

    struct Cloud final : CloudSetupManager {
        explicit Cloud(SetupHost& itsHost) : host(itsHost) {}
        bool creating() override { return host._answer("cloud.creating", host.answers.creating); }
        bool hasCorvidProvidedID() override {
            return host._answer("cloud.hasCorvidProvidedID", host.answers.hasCorvidProvidedID);
        }
        bool abortSetup() override {
            return host._answer("cloud.abortSetup", host._hasSeeded ? host.answers.abortSetupAfterSeeding
                                                                    : host.answers.abortSetup);
        }
        Dictionary mainAccountResponseDict() override {
            return host._answer("cloud.mainAccountResponseDict", host.answers.mainAccountResponseDict);
        }
        Text username() override {
            return host._answer(
                "cloud.username",
                Text(host._hasConfigured ? host.answers.usernameAfterConfiguring : host.answers.username));
        }
        Text password() override { return host._answer("cloud.password", Text("cloud password")); }
        bool backupIsEnabled() override {
            return host._answer("cloud.backupIsEnabled", host.flags.backupIsEnabled);
        }
        void setBackupIsEnabled(bool value) override {
            host._set("cloud.setBackupIsEnabled", host.flags.backupIsEnabled, value);
        }
        void setIsBackupNoCircleRecovery(bool value) override {
            host._set("cloud.setIsBackupNoCircleRecovery", host.flags.isBackupNoCircleRecovery, value);
        }
        void setAbortSyncSetup(bool value) override {
            host._set("cloud.setAbortSyncSetup", host.flags.abortSyncSetup, value);
        }
        SetupHost& host;
    };

    struct Helper final : WLLoginHelper {
        explicit Helper(SetupHost& itsHost) : host(itsHost) {}
        void createKeychain(const Text& userName, const Text& password) override {
            host._recorder.record("helper.createKeychain " + text::describe(userName) + ", " +
                                  text::describe(password));
        }
        void configureNimbusAccountForKeychainSyncKVSPasswordBag(const Text& userName, const Text& password,
                                                                 const Dictionary& bag) override {
            host._hasConfigured = true;
            host._recorder.record("helper.configure " + text::describe(userName) + ", " +
                                  text::describe(password) + ", " +
                                  (bag ? text::describe(PropertyList(*bag)) : "none"));
        }
        bool seedKeychainComponentsWithIDPassword(const Text& userName, const Text& password) override {
            host._hasSeeded = true;
            return host._answer("helper.seed " + text::describe(userName) + ", " + text::describe(password),
                                host.answers.seedKeychainComponents);
        }
        Dictionary queryKeychainSyncStatus(const std::optional<PropertyList>& query) override {
            return host._answer(query ? "helper.query something" : "helper.query none",
                                host.answers.keychainSyncStatus);
        }
        bool isBackupEnabled() override {
            return host._answer("helper.isBackupEnabled", host.answers.isBackupEnabled);
        }
        bool escrowUsesComplexPasscode() override {
            return host._answer("helper.escrowUsesComplexPasscode", host.answers.escrowUsesComplexPasscode);
        }
        SetupHost& host;
    };

    template <class Answer>
    Answer _answer(const std::string& operation, Answer answer) {
        _recorder.record(operation);
        return answer;
    }

    void _set(const std::string& operation, bool& flag, bool value) {
        _recorder.record(operation + (value ? " 1" : " 0"));
        flag = value;
    }

    fakes::CallRecorder& _recorder;
    bool _hasConfigured = false;
    bool _hasSeeded = false;
    NetworkingManager _network;
    User _user{*this};
    Cloud _cloud{*this};
    Helper _helper{*this};
};

} // namespace welcomer
