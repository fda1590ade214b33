#include "tools/welcomer/story/ScenarioHost.h"

#include "propertylist/PropertyListReadings.h"
#include "tools/welcomer/terminal/Failure.h"

#include <map>
#include <string_view>

namespace welcomer::tool {

namespace {

using OptionalText = std::optional<std::string>;
using OptionalDictionary = std::optional<PropertyList::Dictionary>;

constexpr char kHost[] = "";
constexpr char kUser[] = "localUserAccountManager";
constexpr char kCloud[] = "NimbusManager";
constexpr char kHelper[] = "wlloginhelper";

enum class Kind { Flag, Text, Dictionary };

// What a scenario and its parts may hold.
const std::map<std::string, std::map<std::string, Kind, std::less<>>, std::less<>> kAnswers = {
    {kHost,
     {{"isMiniGreeter", Kind::Flag},
      {"isKeychainUpsellGreeter", Kind::Flag},
      {"internetIsReachable", Kind::Flag},
      {"screenLockRequiresPassword", Kind::Flag},
      {kUser, Kind::Dictionary},
      {kCloud, Kind::Dictionary},
      {kHelper, Kind::Dictionary}}},
    {kUser, {{"secureMyDesk", Kind::Flag}, {"userName", Kind::Text}, {"password", Kind::Text}}},
    {kCloud,
     {{"creating", Kind::Flag},
      {"hasCorvidProvidedID", Kind::Flag},
      {"abortSetup", Kind::Flag},
      {"abortSetupAfterSeeding", Kind::Flag},
      {"mainAccountResponseDict", Kind::Dictionary},
      {"username", Kind::Text},
      {"password", Kind::Text}}},
    {kHelper,
     {{"seedKeychainComponents", Kind::Flag},
      {"queryKeychainSyncStatus", Kind::Dictionary},
      {"isBackupEnabled", Kind::Flag},
      {"escrowUsesComplexPasscode", Kind::Flag}}},
};

bool isOfKind(const PropertyList& value, Kind kind) {
    switch (kind) {
    case Kind::Flag:
        return !value.isDictionary() && !value.isArray() && !value.data() && !value.date();
    case Kind::Text:
        return value.isString();
    case Kind::Dictionary:
        return value.isDictionary();
    }
    return false;
}

void check(const PropertyList::Dictionary& answers, const char* part) {
    const auto& known = kAnswers.at(part);
    for (const auto& [name, value] : answers) {
        const std::string path = *part == '\0' ? name : part + ("." + name);
        const auto found = known.find(name);
        if (found == known.end()) {
            throw CommandFailure("the scenario's " + path + " means nothing");
        }
        if (!isOfKind(value, found->second)) {
            throw CommandFailure("the scenario's " + path + " is of the wrong type");
        }
        if (*part == '\0' && kAnswers.contains(name)) {
            check(*value.dictionary(), name.c_str());
        }
    }
}

std::string shown(const OptionalText& text) {
    return text ? *text : "none";
}

std::string shown(bool flag) {
    return flag ? "true" : "false";
}

} // namespace

class ScenarioHost::User final : public LocalUserAccountManager {
  public:
    explicit User(ScenarioHost& host) : _host(host) {}
    bool secureMyDesk() override { return _host._answer(kUser, "secureMyDesk"); }
    OptionalText userName() override { return _host._text(kUser, "userName"); }
    OptionalText password() override { return _host._text(kUser, "password"); }

  private:
    ScenarioHost& _host;
};

class ScenarioHost::Cloud final : public CloudSetupManager {
  public:
    explicit Cloud(ScenarioHost& host) : _host(host) {}
    bool creating() override { return _host._answer(kCloud, "creating"); }
    bool hasCorvidProvidedID() override { return _host._answer(kCloud, "hasCorvidProvidedID"); }
    bool abortSetup() override {
        const bool hasOtherAnswer = _host._hasSeeded && _host._find(kCloud, "abortSetupAfterSeeding");
        return _host._answer(kCloud, hasOtherAnswer ? "abortSetupAfterSeeding" : "abortSetup");
    }
    OptionalDictionary mainAccountResponseDict() override {
        OptionalDictionary response = _host._dictionary(kCloud, "mainAccountResponseDict");
        _host._calls.push_back(std::string("NimbusManager.mainAccountResponseDict: ") +
                               (response ? "a response" : "none"));
        return response;
    }
    OptionalText username() override { return _host._text(kCloud, "username"); }
    OptionalText password() override { return _host._text(kCloud, "password"); }
    bool backupIsEnabled() override {
        _host._calls.push_back("NimbusManager.backupIsEnabled: " + shown(_host._flags.backupIsEnabled));
        return _host._flags.backupIsEnabled;
    }
    void setBackupIsEnabled(bool value) override {
        _set("setBackupIsEnabled:", _host._flags.backupIsEnabled, value);
    }
    void setIsBackupNoCircleRecovery(bool value) override {
        _set("setIsBackupNoCircleRecovery:", _host._flags.isBackupNoCircleRecovery, value);
    }
    void setAbortSyncSetup(bool value) override {
        _set("setAbortSyncSetup:", _host._flags.abortSyncSetup, value);
    }

  private:
    void _set(const char* operation, bool& flag, bool value) {
        _host._calls.push_back(std::string("NimbusManager.") + operation + " " + shown(value));
        flag = value;
    }

    ScenarioHost& _host;
};

class ScenarioHost::Helper final : public WLLoginHelper {
  public:
    explicit Helper(ScenarioHost& host) : _host(host) {}
    void createKeychain(const OptionalText& userName, const OptionalText&) override {
        _host._calls.push_back("wlloginhelper.createKeychain:: " + shown(userName));
    }
    void configureNimbusAccountForKeychainSyncKVSPasswordBag(const OptionalText& userName,
                                                             const OptionalText&,
                                                             const OptionalDictionary& bag) override {
        _host._calls.push_back("wlloginhelper.configureNimbusAccountForKeychainSyncKVS:password:bag: " +
                               shown(userName) + (bag ? ", a response" : ", none"));
    }
    bool seedKeychainComponentsWithIDPassword(const OptionalText& userName, const OptionalText&) override {
        _host._hasSeeded = true;
        const bool answer = _host._flag(kHelper, "seedKeychainComponents");
        _host._calls.push_back("wlloginhelper.seedKeychainComponentsWithID:password: " + shown(userName) +
                               ": " + shown(answer));
        return answer;
    }
    OptionalDictionary queryKeychainSyncStatus(const std::optional<PropertyList>&) override {
        OptionalDictionary answer = _host._dictionary(kHelper, "queryKeychainSyncStatus");
        _host._calls.push_back(std::string("wlloginhelper.queryKeychainSyncStatus: none: ") +
                               (answer ? "a dictionary" : "none"));
        return answer;
    }
    bool isBackupEnabled() override { return _host._answer(kHelper, "isBackupEnabled"); }
    bool escrowUsesComplexPasscode() override { return _host._answer(kHelper, "escrowUsesComplexPasscode"); }

  private:
    ScenarioHost& _host;
};

ScenarioHost::ScenarioHost(const PropertyList& scenario)
    : _user(std::make_unique<User>(*this)),
      _cloud(std::make_unique<Cloud>(*this)),
      _helper(std::make_unique<Helper>(*this)) {
    if (!scenario.isDictionary()) {
        throw CommandFailure("the scenario is no dictionary");
    }
    _scenario = *scenario.dictionary();
    check(_scenario, kHost);
}

ScenarioHost::~ScenarioHost() = default;

std::optional<bool> ScenarioHost::internetIsReachable() const {
    const char* const name = "internetIsReachable";
    return _find(kHost, name) ? std::optional(_flag(kHost, name)) : std::nullopt;
}

std::optional<bool> ScenarioHost::screenLockRequiresPassword() const {
    const char* const name = "screenLockRequiresPassword";
    return _find(kHost, name) ? std::optional(_flag(kHost, name)) : std::nullopt;
}

bool ScenarioHost::isMiniGreeter() {
    return _answer(kHost, "isMiniGreeter");
}

bool ScenarioHost::isKeychainUpsellGreeter() {
    return _answer(kHost, "isKeychainUpsellGreeter");
}

LocalUserAccountManager& ScenarioHost::localUserAccountManager() {
    return *_user;
}

NetworkingManager& ScenarioHost::networkingManager() {
    _calls.emplace_back("SetupStateManager.networkingManager");
    return _network ? *_network : _network.emplace();
}

CloudSetupManager& ScenarioHost::NimbusManager() {
    return *_cloud;
}

WLLoginHelper& ScenarioHost::wlloginhelper() {
    return *_helper;
}

const PropertyList* ScenarioHost::_find(const char* part, const char* name) const {
    const PropertyList::Dictionary* answers = &_scenario;
    if (*part != '\0') {
        const auto found = _scenario.find(part);
        if (found == _scenario.end()) {
            return nullptr;
        }
        answers = found->second.dictionary();
    }
    const auto found = answers->find(name);
    return found == answers->end() ? nullptr : &found->second;
}

std::optional<std::string> ScenarioHost::_text(const char* part, const char* name) const {
    const PropertyList* value = _find(part, name);
    return value ? OptionalText(*value->string()) : std::nullopt;
}

std::optional<PropertyList::Dictionary> ScenarioHost::_dictionary(const char* part, const char* name) const {
    const PropertyList* value = _find(part, name);
    return value ? OptionalDictionary(*value->dictionary()) : std::nullopt;
}

bool ScenarioHost::_flag(const char* part, const char* name) const {
    const PropertyList* value = _find(part, name);
    return value && booleanReading(*value);
}

bool ScenarioHost::_answer(const char* part, const char* name) {
    const bool answer = _flag(part, name);
    _calls.push_back((*part == '\0' ? std::string("SetupStateManager") : part) + "." + name + ": " +
                     shown(answer));
    return answer;
}

} // namespace welcomer::tool
