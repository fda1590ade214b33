// welcomer account: the accounts of the current user, and who can sign in.

#include "cloud/WLLoggedInNimbusAccount.h"
#include "platform/Platform.h"
#include "plugins/DelegateIdentifiers.h"
#include "plugins/WLNimbusDelegatesRequest.h"
#include "propertylist/UTF8.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/story/DelegateResponses.h"
#include "tools/welcomer/story/ServiceStates.h"
#include "tools/welcomer/story/SetupFlow.h"
#include "tools/welcomer/terminal/Password.h"

#include <algorithm>
#include <cerrno>
#include <iterator>
#include <memory>
#include <set>

namespace welcomer::tool {

namespace {

struct AddArguments {
    std::string user;
    std::string mailAddress;
    std::vector<std::string> aliases;
    std::vector<std::string> responses;
    PasswordSource password;
};

struct SignInArguments {
    std::string user;
    PasswordSource password;
};

struct RemoveArguments {
    std::string name;
    bool fromDirectory = false;
};

void refuseEmpty(const std::string& user) {
    if (user.empty()) {
        throw UsageError("the user's name is empty");
    }
}

// Whether a text that is UTF-8 has a control character: U+0000 to U+001F and U+007F to U+009F.
bool hasControlCharacter(const std::string& text) {
    bool isAfterC2 = false; // the lead byte of U+0080 to U+00BF
    return std::ranges::any_of(text, [&](char each) {
        const auto byte = static_cast<unsigned char>(each);
        const bool isControl = byte < 0x20 || byte == 0x7F || (isAfterC2 && byte < 0xA0);
        isAfterC2 = byte == 0xC2;
        return isControl;
    });
}

// Refuses names that nobody could type, or that would be taken for an option or a path.
void refuseUnusable(const std::string& user) {
    refuseEmpty(user);
    if (user.starts_with('-')) {
        throw UsageError("a user's name does not begin with \"-\": " + user);
    }
    if (user.find('/') != std::string::npos) {
        throw UsageError("a user's name holds no slash: " + user);
    }
    if (const std::size_t offset = findInvalidXMLText(user); offset != std::string::npos) {
        throw UsageError("a user's name cannot hold " + describeInvalidXMLText(user, offset));
    }
    if (hasControlCharacter(user)) {
        throw UsageError("a user's name holds no control character: " + user);
    }
}

CommandFailure existsAlready(const std::string& user) {
    return CommandFailure("the user " + user + " exists already");
}

// What the server will answer: a response for every delegate that the system knows, with the aliases on offer
// for those that have aliases, and what was given in their place or beside them.
PropertyList::Dictionary responseFor(const std::vector<std::string>& aliases,
                                     const PropertyList::Dictionary& given) {
    PropertyList::Dictionary delegates;
    for (const char* identifier : {kVidlinkIdentifier, kChatterIdentifier}) {
        delegates[identifier] = PropertyList::Dictionary{
            {platform::kStatusKey, 0}, {"aliases", PropertyList::Array(aliases.begin(), aliases.end())}};
    }
    for (const std::string& identifier : WLNimbusStoreDelegateIdentifiers()) {
        delegates[identifier] = PropertyList::Dictionary{{platform::kStatusKey, 0}};
    }
    for (const auto& [identifier, response] : given) {
        delegates.insert_or_assign(identifier, response);
    }
    return {{platform::kStatusKey, 0}, {platform::kDelegatesKey, delegates}};
}

Report add(Session& session, const AddArguments& arguments) {
    refuseUnusable(arguments.user);
    const PropertyList::Dictionary responses = readDelegateResponses(arguments.responses);
    platform::AccountDirectory& directory = session.accountDirectory;
    // So that nobody is asked for a password in vain; adding decides.
    const auto users = directory.users();
    if (users && std::ranges::find(*users, arguments.user) != users->end()) {
        throw existsAlready(arguments.user);
    }
    const posix::SecretText password =
        getNewPassword(arguments.password, "New password for " + arguments.user + ":");
    platform::CloudUser user{arguments.user, password.text(), std::nullopt,
                             responseFor(arguments.aliases, responses)};
    const posix::WipedAtEnd wiped(user.password);
    if (!arguments.mailAddress.empty()) {
        user.mailAddress = arguments.mailAddress;
    }
    if (const platform::Outcome outcome = directory.addUser(user); !outcome) {
        throw outcome.error.number == EEXIST
            ? existsAlready(arguments.user)
            : CommandFailure("cannot add " + arguments.user + ": " + outcome.error.message);
    }
    return Report({{"user", arguments.user}, {"added", true}},
                  "Added " + arguments.user + ", who can sign in from now on.");
}

std::string loggedInName() {
    const auto account = WLLoggedInNimbusAccount();
    return account ? account->accountID() : "";
}

Report list(Session& session) {
    platform::AccountDirectory& directory = session.accountDirectory;
    const std::vector<std::string> accounts = directory.accounts();
    const auto users = directory.users();
    const std::string loggedIn = loggedInName();
    const auto hasAccount = [&](const std::string& name) {
        return std::ranges::find(accounts, name) != accounts.end();
    };
    const auto canSignIn = [&](const std::string& name) {
        return users && std::ranges::find(*users, name) != users->end();
    };
    std::set<std::string> names(accounts.begin(), accounts.end());
    if (users) {
        names.insert(users->begin(), users->end());
    }
    Json entries = Json::array();
    for (const std::string& name : names) {
        entries.push_back({{"name", name},
                           {"canSignIn", users ? Json(canSignIn(name)) : Json()},
                           {"hasAccount", hasAccount(name)},
                           {"loggedIn", name == loggedIn}});
    }
    Report report;
    report.document = {{"accounts", entries}};
    if (names.empty()) {
        return report.line("No accounts, and nobody who can sign in.");
    }
    return report.table(entries, {{"NAME", "name"},
                                  {"CAN SIGN IN", "canSignIn", "unknown"},
                                  {"ACCOUNT", "hasAccount"},
                                  {"LOGGED IN", "loggedIn"}});
}

// Whoever has an account or can sign in, as far as the user can see.
std::vector<std::string> knownNames(Session& session) {
    std::vector<std::string> names = session.accountDirectory.accounts();
    if (const auto users = session.accountDirectory.users()) {
        std::ranges::copy_if(*users, std::back_inserter(names), [&](const std::string& name) {
            return std::ranges::find(names, name) == names.end();
        });
    }
    return names;
}

Report status(Session& /*session*/) {
    const auto account = WLLoggedInNimbusAccount();
    const std::vector<std::string> enabled = enabledServices(serviceStates(account.get()));
    const bool noneIsEnabled = WLNoNimbusServicesEnabled();
    Report report;
    report.document = {{"loggedIn", account ? Json(account->accountID()) : Json()},
                       {"enabledServices", enabled},
                       {"noServicesEnabled", noneIsEnabled}};
    if (!account) {
        return report.line("Nobody is logged in to a cloud account.");
    }
    std::string names;
    for (const std::string& identifier : enabled) {
        names += (names.empty() ? "" : ", ") + serviceName(identifier);
    }
    return report.fields(
        {{"Logged in:", account->accountID()}, {"Enabled services:", names + (noneIsEnabled ? "none" : "")}});
}

Report signIn(Session& session, const SignInArguments& arguments) {
    refuseEmpty(arguments.user);
    SetupFlow::checkWhoIsLoggedIn(arguments.user);
    const std::string server = session.signInDirectory.server();
    tellAskedServer(session);
    SetupFlow flow(session.log, !session.options.verbose);
    const posix::SecretText password =
        getPassword(arguments.password, "Password for " + arguments.user + ":");
    flow.signIn(arguments.user, password.text());
    flow.complete({}, false); // no service: that is for setup
    Report report({{"account", arguments.user}, {"signedIn", true}}, arguments.user + " is signed in.");
    if (!server.empty()) {
        report.document["server"] = server;
    }
    return report;
}

Report showServices(const std::string& user) {
    std::shared_ptr<platform::CloudAccount> account;
    if (user.empty()) {
        account = WLLoggedInNimbusAccount();
    } else {
        account = platform::current().accountService.sharedManager().accountForID(user, false);
    }
    if (!account) {
        throw CommandFailure(user.empty() ? "nobody is logged in to a cloud account; name one"
                                          : "there is no account " + user);
    }
    Report report;
    report.document = {{"account", account->accountID()}, {"services", toJson(serviceStates(account.get()))}};
    addServiceTable(report, report.document["services"]);
    return report;
}

Report remove(Session& session, const RemoveArguments& arguments) {
    refuseEmpty(arguments.name);
    platform::AccountDirectory& directory = session.accountDirectory;
    const platform::Outcome outcome = arguments.fromDirectory ? directory.removeUser(arguments.name)
                                                              : directory.removeAccount(arguments.name);
    if (!outcome) {
        throw CommandFailure("cannot remove " + arguments.name + ": " + outcome.error.message);
    }
    return Report({{"account", arguments.name}, {"removed", true}},
                  arguments.fromDirectory ? arguments.name + " cannot sign in any more."
                                          : "Removed the account " + arguments.name + ".");
}

Report signOut(Session& session) {
    const std::string account = loggedInName();
    if (const platform::Outcome outcome = session.accountDirectory.signOut(); !outcome) {
        throw CommandFailure(outcome.error.number == ENOENT ? "nobody is logged in to a cloud account"
                                                            : "cannot sign out: " + outcome.error.message);
    }
    return Report({{"account", account.empty() ? Json() : Json(account)}, {"signedOut", true}},
                  (account.empty() ? "The account" : account) + " is signed out.");
}

void addAdd(CommandLine& commandLine, CommandLevel group) {
    const auto arguments = std::make_shared<AddArguments>();
    CommandLevel command =
        commandLine.addCommand(group, "add",
                               "Let somebody sign in: adds a user to the machine's directory of users, which "
                               "stands for the server",
                               [arguments](Session& session) { return add(session, *arguments); });
    command.option("user", arguments->user, "The user's name").called("USER").required();
    command.option("--mail", arguments->mailAddress, "The address of the account's mail service")
        .called("ADDRESS");
    command
        .option("--alias", arguments->aliases,
                "An alias that is offered for video calling and messaging; may be given several times")
        .called("A")
        .repeated();
    command
        .option("--response", arguments->responses,
                "What the server answers a delegate, a property list; may be given several times")
        .called("ID=PLIST")
        .repeated();
    CommandLine::addPasswordOption(command, arguments->password);
}

void addSignIn(CommandLine& commandLine, CommandLevel group) {
    const auto arguments = std::make_shared<SignInArguments>();
    CommandLevel command =
        commandLine.addCommand(group, "sign-in", "Sign in to an account, without enabling any service",
                               [arguments](Session& session) { return signIn(session, *arguments); });
    command.option("user", arguments->user, "The user's name").called("USER").required();
    CommandLine::addPasswordOption(command, arguments->password);
    commandLine.addUserOption(command);
}

void addRemove(CommandLine& commandLine, CommandLevel group) {
    const auto arguments = std::make_shared<RemoveArguments>();
    CommandLevel command =
        commandLine.addCommand(group, "remove", "Remove an account with the states of its services",
                               [arguments](Session& session) { return remove(session, *arguments); });
    command.option("account", arguments->name, "The account's name").called("NAME").required();
    const CommandOption fromDirectory =
        command.flag("--from-directory", arguments->fromDirectory,
                     "Remove what `account add` has added instead: nobody of that name can sign in any "
                     "more, and accounts stay");
    commandLine.addUserOption(command).excludes(fromDirectory);
}

} // namespace

void addAccountCommands(CommandLine& commandLine) {
    CommandLevel group = commandLine.addGroup("account", "The user's cloud accounts, and who can sign in");
    commandLine.offerValues("USER", knownNames);
    addAdd(commandLine, group);
    commandLine.addUserOption(
        commandLine.addCommand(group, "list", "Show the accounts, and who can sign in", list));
    commandLine.addUserOption(commandLine.addCommand(
        group, "status", "Show who is logged in, with the services that are enabled", status));
    addSignIn(commandLine, group);
    commandLine.addUserOption(commandLine.addCommand(
        group, "sign-out", "Have no account be logged in; the account itself stays", signOut));
    addRemove(commandLine, group);

    const auto user = std::make_shared<std::string>();
    CommandLevel services = commandLine.addCommand(group, "services", "Show the services of an account",
                                                   [user](Session&) { return showServices(*user); });
    services.option("user", *user, "The account; without it the one that is logged in").called("USER");
    commandLine.addUserOption(services);
}

} // namespace welcomer::tool
