#include "backends/local/accounts/NimbusDirectory.h"

#include "backends/local/DictionaryFile.h"
#include "backends/local/accounts/PasswordHash.h"
#include "backends/posix/Directory.h"
#include "platform/AccountService.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListReadings.h"

#include <algorithm>
#include <cerrno>
#include <utility>

namespace welcomer::local {

namespace {

constexpr char kUsersKey[] = "Users";
constexpr char kPasswordKey[] = "Password";
constexpr char kResponseKey[] = "Response";
constexpr char kAccountErrorKey[] = "AccountError";
constexpr char kAccountErrorInfoKey[] = "AccountErrorInfo";
constexpr char kFailsKey[] = "Fails";
constexpr char kDelaySecondsKey[] = "DelaySeconds";
constexpr char kMailAddressKey[] = "MailAddress";
constexpr char kServicesKey[] = "Services";
constexpr char kPropertiesKey[] = "Properties";

constexpr mode_t kFolderMode = 0755; // the folder is not for the directory alone

platform::Outcome failure(std::string message) {
    return platform::Outcome::failure({0, std::move(message)});
}

platform::SignInAnswer accountError(std::int64_t error) {
    return {false, {{platform::kSKPropertyAccountError, error}}, 0};
}

bool isRightPassword(const PropertyList& user, const std::string& password) {
    const std::string* const hash = textIn(user, kPasswordKey);
    return hash && passwordMatches(password, *hash);
}

double delaySeconds(const PropertyList& user) {
    const PropertyList* delay = user.find(kDelaySecondsKey);
    if (!delay) {
        return 0;
    }
    return std::max(0.0, delay->real().value_or(static_cast<double>(delay->integer().value_or(0))));
}

// Whatever is no plain "no" has the operation fail.
bool fails(const PropertyList& user) {
    const PropertyList* setting = user.find(kFailsKey);
    return user.find(kAccountErrorKey) || (setting && integerIn(*setting) != 0);
}

// The answer to the right password.
platform::SignInAnswer answerOf(const std::string& username, const PropertyList& user) {
    const PropertyList* response = user.find(kResponseKey);
    if (response && !response->isDictionary()) {
        return accountError(platform::kSKAccountErrorServerUnavailable);
    }
    platform::SignInAnswer answer;
    answer.isCompleted = !fails(user);
    answer.delaySeconds = delaySeconds(user);
    if (response) {
        answer.contents = *response->dictionary();
    } else if (answer.isCompleted) {
        answer.contents = {{platform::kStatusKey, 0}};
    }
    answer.contents.insert_or_assign(platform::kSKPropertyAccountID, username);
    if (const PropertyList* error = user.find(kAccountErrorKey)) {
        answer.contents.insert_or_assign(platform::kSKPropertyAccountError, *error);
    }
    if (const PropertyList* info = user.find(kAccountErrorInfoKey)) {
        answer.contents.insert_or_assign(platform::kSKPropertyAccountErrorInfo, *info);
    }
    return answer;
}

PropertyList::Dictionary everyService() {
    PropertyList::Dictionary services;
    for (const char* identifier : platform::kSKServiceIDs) {
        services.emplace(identifier, PropertyList::Dictionary{});
    }
    return services;
}

void setMailAddress(PropertyList::Dictionary& services, const PropertyList& address) {
    PropertyList::Dictionary* const mail = dictionaryIn(services, platform::kSKServiceIDMail);
    if (!mail) {
        return;
    }
    PropertyList& properties = (*mail)[kPropertiesKey];
    if (PropertyList::Dictionary* values = properties.dictionary()) {
        values->emplace(platform::kSKPropertyMailEmailAddress, address); // one that is there already stays
    }
}

} // namespace

NimbusDirectory::Found NimbusDirectory::_find(const std::string& username,
                                              const std::string& password) const {
    const std::shared_ptr<const PropertyList::Dictionary> users = _users();
    if (!users) {
        return {std::nullopt, accountError(platform::kSKAccountErrorServerUnavailable)};
    }
    const PropertyList* const user = valueIn(*users, username);
    if (!user) {
        // It takes as long as a wrong password, so that nobody learns from it who is there.
        static_cast<void>(!users->empty() && isRightPassword(users->begin()->second, password));
        return {std::nullopt, accountError(platform::kSKAccountErrorUnknownUser)};
    }
    if (!isRightPassword(*user, password)) {
        return {std::nullopt, accountError(platform::kSKAccountErrorWrongPassword)};
    }
    return {*user, {}};
}

platform::SignInAnswer NimbusDirectory::answer(const std::string& username, const std::string& password,
                                               const PropertyList::Dictionary& /*delegateRequest*/) const {
    const Found found = _find(username, password);
    return found.user ? answerOf(username, *found.user) : found.refusal;
}

platform::SignInAnswer NimbusDirectory::acceptTerms(const std::string& username, const std::string& password,
                                                    const PropertyList& terms) const {
    const Found found = _find(username, password);
    if (!found.user) {
        return found.refusal;
    }
    platform::SignInAnswer answer{true, {}, 0};
    const platform::Outcome outcome = _change([&](PropertyList::Dictionary& users, const std::string&) {
        PropertyList::Dictionary* const user = dictionaryIn(users, username);
        const PropertyList* const error = valueIn(user, kAccountErrorKey);
        if (!error || integerIn(*error) != platform::kSKAccountErrorTermsOfService) {
            return platform::Outcome::success();
        }
        const PropertyList* const info = valueIn(user, kAccountErrorInfoKey);
        if (!info || *info != terms) {
            answer = accountError(platform::kSKAccountErrorTermsOfService);
            if (info) {
                answer.contents.insert_or_assign(platform::kSKPropertyAccountErrorInfo, *info);
            }
            return platform::Outcome::success();
        }
        user->erase(kAccountErrorKey);
        user->erase(kAccountErrorInfoKey);
        return platform::Outcome::success();
    });
    if (!outcome) {
        answer = accountError(platform::kSKAccountErrorServerUnavailable);
        answer.contents.insert_or_assign(platform::kSKPropertyAccountErrorInfo, outcome.error.message);
    }
    return answer;
}

PropertyList::Dictionary NimbusDirectory::servicesOfNewAccount(const std::string& username) const {
    const std::shared_ptr<const PropertyList::Dictionary> users = _users();
    const PropertyList* const user = users ? valueIn(*users, username) : nullptr;
    const PropertyList::Dictionary* const own = dictionaryIn(user, kServicesKey);
    PropertyList::Dictionary services = own ? *own : everyService();
    if (const PropertyList* address = valueIn(user, kMailAddressKey)) {
        setMailAddress(services, *address);
    }
    return services;
}

std::optional<std::vector<std::string>> NimbusDirectory::userNames() const {
    const DictionaryFileContent file = readDictionaryFile(_root, kNimbusDirectoryPath);
    std::vector<std::string> names;
    const PropertyList* const users = valueIn(file.values, kUsersKey);
    if (file.state != DictionaryFileContent::State::Whole || (users && !users->isDictionary())) {
        return std::nullopt;
    }
    if (users) {
        for (const auto& [name, user] : *users->dictionary()) {
            names.push_back(name);
        }
    }
    return names;
}

platform::Outcome NimbusDirectory::writeUser(const platform::CloudUser& user, IfThere ifThere) const {
    const std::optional<std::string> hash = makePasswordHash(user.password);
    if (!hash) {
        return failure("the system can make no hash of this password");
    }
    PropertyList::Dictionary entry{{kPasswordKey, *hash}, {kResponseKey, user.response}};
    if (user.mailAddress) {
        entry[kMailAddressKey] = *user.mailAddress;
    }
    return _change([&](PropertyList::Dictionary& users, const std::string& shown) {
        if (ifThere == IfThere::Fail && users.contains(user.name)) {
            return platform::Outcome::failure(
                {EEXIST, shown + ": the user " + user.name + " exists already"});
        }
        users.insert_or_assign(user.name, std::move(entry));
        return platform::Outcome::success();
    });
}

platform::Outcome NimbusDirectory::removeUser(const std::string& name) const {
    if (userNames() == std::vector<std::string>()) { // perhaps there is no directory: none is made for this
        return platform::Outcome::failure({ENOENT, "there is no user " + name});
    }
    return _change([&](PropertyList::Dictionary& users, const std::string& shown) {
        return users.erase(name) > 0
                   ? platform::Outcome::success()
                   : platform::Outcome::failure({ENOENT, shown + ": there is no user " + name});
    });
}

platform::Outcome NimbusDirectory::_change(const Change& change) const {
    const posix::PathParts path = posix::splitPath(kNimbusDirectoryPath);
    posix::makeDirectories(_root, path.folder, kFolderMode);
    LockedDictionaryFolder folder(_root, path.folder, posix::machineLockPath(posix::kMachineFilesLock),
                                  kFolderMode);
    if (!folder) {
        return platform::Outcome::failure(folder.error());
    }
    const std::string shown = _root.shown(kNimbusDirectoryPath);
    DictionaryFileContent file = readDictionaryFile(_root, kNimbusDirectoryPath);
    if (file.state != DictionaryFileContent::State::Whole) {
        return failure(shown + ": " + file.reason);
    }
    PropertyList& users = file.values.emplace(kUsersKey, PropertyList::Dictionary{}).first->second;
    if (!users.isDictionary()) {
        return failure(shown + ": " + kUsersKey + " is no dictionary");
    }
    if (platform::Outcome outcome = change(*users.dictionary(), shown); !outcome) {
        return outcome;
    }
    return folder.write(path.name, file.values) ? platform::Outcome::success()
                                                : platform::Outcome::failure(folder.error());
}

std::shared_ptr<const PropertyList::Dictionary> NimbusDirectory::_users() const {
    const std::shared_ptr<const DictionaryFileContent> file = _file.content();
    return {file, dictionaryIn(file->values, kUsersKey)};
}

} // namespace welcomer::local
