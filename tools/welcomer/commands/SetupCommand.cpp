// welcomer setup: a first-run flow for the terminal, and the reference of what a setup application does.

#include "cloud/WLNimbusServiceCatalogue.h"
#include "handoff/LaunchAgentFile.h"
#include "platform/Platform.h"
#include "text/Format.h"
#include "tools/welcomer/cli/PropertyListFile.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/cli/ToolBundle.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/story/ServiceStates.h"
#include "tools/welcomer/story/SetupFlow.h"
#include "tools/welcomer/terminal/Password.h"
#include "tools/welcomer/terminal/Terminal.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <memory>
#include <optional>
#include <utility>

namespace welcomer::tool {

namespace {

constexpr int kSignInAttempts = 3;
constexpr const char* kInsteadOfTerminal = "--answers PLIST";

constexpr const char* kAccountKey = "Account";
constexpr const char* kServicesKey = "Services";
constexpr const char* kAliasesKey = "Aliases";
constexpr const char* kJustTheAccountAndKVSKey = "JustTheAccountAndKVS";

struct SetupArguments {
    std::string answers;
    std::string bundle; // empty: the one that comes with the tool
    PasswordSource password;
};

// What the user decided.
struct Decisions {
    std::string account;
    std::vector<std::string> services; // identifiers
    ChosenAliases aliases;
    bool justTheAccountAndKVS = false;
};

std::string joined(const std::vector<std::string>& texts) {
    std::string result;
    for (const std::string& text : texts) {
        result += (result.empty() ? "" : ", ") + text;
    }
    return result.empty() ? "none" : result;
}

std::string namesOf(const std::vector<std::string>& services) {
    std::vector<std::string> names;
    std::ranges::transform(services, std::back_inserter(names), serviceName);
    return joined(names);
}

std::vector<CatalogueEntry> catalogueOf(bool isPostLogin) {
    std::vector<CatalogueEntry> entries = serviceCatalogue();
    std::erase_if(entries, [=](const CatalogueEntry& entry) { return entry.isPostLogin != isPostLogin; });
    return entries;
}

// A file with the answers: a dictionary with the account's name, and where not everything is wanted the
// services and, by delegate identifier, the aliases.
class Answers {
  public:
    explicit Answers(const std::string& file) : _file(file) {
        const PropertyList content = readPropertyListFile(file);
        if (!content.isDictionary()) {
            _fail("the answers are no dictionary");
        }
        _values = *content.dictionary();
        for (const auto& [key, value] : _values) {
            if (key != kAccountKey && key != kServicesKey && key != kAliasesKey &&
                key != kJustTheAccountAndKVSKey) {
                _fail("no question is called " + key);
            }
        }
        const PropertyList* account = _find(kAccountKey);
        if (!account || !account->isString() || account->string()->empty()) {
            _fail(std::string(kAccountKey) + " is to be the account's name");
        }
        decisions.account = *account->string();
        _readServices();
        if (const PropertyList* flag = _find(kJustTheAccountAndKVSKey)) {
            if (!flag->boolean()) {
                _fail(std::string(kJustTheAccountAndKVSKey) + " is to be true or false");
            }
            decisions.justTheAccountAndKVS = *flag->boolean();
        }
        _checkAliases();
    }

    // Takes the chosen aliases, all that are on offer where the answers say nothing.
    void choose(const std::vector<AliasOffer>& offers) {
        for (const AliasOffer& offer : offers) {
            decisions.aliases[offer.identifier] = offer.aliases;
        }
        const PropertyList* aliases = _find(kAliasesKey);
        for (const auto& [identifier, wanted] :
             aliases ? *aliases->dictionary() : PropertyList::Dictionary()) {
            const auto offer = std::ranges::find(offers, identifier, &AliasOffer::identifier);
            if (offer == offers.end()) {
                _fail(identifier + " has no aliases on offer");
            }
            std::vector<std::string> chosen = _texts(wanted, kAliasesKey);
            for (const std::string& alias : chosen) {
                if (std::ranges::find(offer->aliases, alias) == offer->aliases.end()) {
                    _fail(text::format("%@ has no alias %@ on offer", identifier, alias));
                }
            }
            decisions.aliases[identifier] = std::move(chosen);
        }
    }

    Decisions decisions;

  private:
    [[noreturn]] void _fail(const std::string& reason) const { throw CommandFailure(_file + ": " + reason); }

    const PropertyList* _find(const char* key) const {
        const auto found = _values.find(key);
        return found == _values.end() ? nullptr : &found->second;
    }

    std::vector<std::string> _texts(const PropertyList& value, const char* key) const {
        std::vector<std::string> texts;
        if (!value.isArray()) {
            _fail(std::string(key) + " is to hold texts in an array");
        }
        for (const PropertyList& element : *value.array()) {
            if (!element.isString()) {
                _fail(std::string(key) + " is to hold texts in an array");
            }
            texts.push_back(*element.string());
        }
        return texts;
    }

    void _readServices() {
        decisions.services = WLNimbusAllSetupServiceIDs();
        if (const PropertyList* services = _find(kServicesKey)) {
            decisions.services.clear();
            for (const std::string& name : _texts(*services, kServicesKey)) {
                try {
                    decisions.services.push_back(serviceNamed(name));
                } catch (const UsageError& error) {
                    _fail(error.what());
                }
            }
        }
    }

    // As far as that is possible before the server has said what is on offer.
    void _checkAliases() const {
        const PropertyList* aliases = _find(kAliasesKey);
        if (aliases && !aliases->isDictionary()) {
            _fail(std::string(kAliasesKey) + " is to be a dictionary by delegate identifier");
        }
    }

    const std::string _file;
    PropertyList::Dictionary _values;
};

std::string askForAccount(Terminal& terminal) {
    std::string account;
    while (account.empty()) {
        account = terminal.ask("Your cloud account's name:");
    }
    SetupFlow::checkWhoIsLoggedIn(account);
    return account;
}

// Asks at the terminal until somebody is signed in; what may have been mistyped is asked for again.
std::string signInAtTerminal(Terminal& terminal, SetupFlow& flow, const PasswordSource& source) {
    std::string account = askForAccount(terminal);
    for (int attempt = 1;; ++attempt) {
        const std::string password = getPassword(source, "Password for " + account + ":");
        try {
            flow.signIn(account, password);
            return account;
        } catch (const SignInFailure& failure) {
            const bool mayBeMistyped = failure.isWrongPassword() || failure.isUnknownUser();
            if (!mayBeMistyped || source || attempt == kSignInAttempts) {
                throw;
            }
            if (failure.isWrongPassword()) {
                terminal.say("The password is wrong. Please try again.");
            } else {
                terminal.say("There is no user " + account + ". Please try again.");
                account = askForAccount(terminal);
            }
        }
    }
}

std::vector<std::string> chooseServices(Terminal& terminal) {
    const std::vector<CatalogueEntry> offered = catalogueOf(false);
    std::vector<std::string> names;
    std::ranges::transform(offered, std::back_inserter(names), &CatalogueEntry::name);
    terminal.say("");
    std::vector<std::string> chosen;
    for (const std::size_t index : terminal.choose(
             "Services that can be turned on now (the others come with the next login):", names)) {
        chosen.push_back(offered[index].identifier);
    }
    for (const CatalogueEntry& entry : catalogueOf(true)) {
        chosen.push_back(entry.identifier); // the next login turns them on, whatever is chosen here
    }
    return chosen;
}

ChosenAliases chooseAliases(Terminal& terminal, const std::vector<AliasOffer>& offers) {
    ChosenAliases chosen;
    for (const AliasOffer& offer : offers) {
        std::vector<std::string>& aliases = chosen[offer.identifier];
        if (offer.aliases.empty()) {
            continue;
        }
        terminal.say("");
        for (const std::size_t index : terminal.choose(
                 std::string("Where can people reach you for ") + offer.purpose + "?", offer.aliases)) {
            aliases.push_back(offer.aliases[index]);
        }
    }
    return chosen;
}

void confirm(Terminal& terminal, const std::vector<AliasOffer>& offers, const Decisions& decisions) {
    std::vector<std::string> now;
    for (const CatalogueEntry& entry : catalogueOf(false)) {
        if (std::ranges::find(decisions.services, entry.identifier) != decisions.services.end()) {
            now.push_back(entry.name);
        }
    }
    terminal.say("");
    terminal.say("Account:        " + decisions.account);
    for (const AliasOffer& offer : offers) {
        terminal.say("Aliases:        " + joined(decisions.aliases.at(offer.identifier)) + " (for " +
                     offer.purpose + ")");
    }
    terminal.say("Services now:   " + joined(now));
    if (!terminal.confirm("Set up this account?")) {
        throw CommandFailure("nothing was set up");
    }
}

Report result(const Decisions& decisions, SetupFlow& flow) {
    const auto account =
        platform::current().accountService.sharedManager().accountForID(decisions.account, false);
    const std::vector<ServiceState> states = serviceStates(account.get());
    std::vector<std::string> later;
    for (const ServiceState& state : states) {
        if (state.entry.isPostLogin && state.canBeEnabled) {
            later.push_back(state.entry.identifier);
        }
    }
    const std::vector<std::string> delegates = flow.delegates();
    Report report;
    report.document = {{"account", decisions.account},
                       {"services", toJson(states)},
                       {"aliases", decisions.aliases},
                       {"launchAgent", kLaunchAgentLabel},
                       {"atNextLogin", {{"services", later}, {"delegates", delegates}}}};
    report.lines({"", decisions.account + " is set up.", ""});
    addServiceTable(report, report.document["services"], "  ");
    return report.lines({"", "At the next login the agent starts, once. It",
                         "  - turns on " + namesOf(later) + ",",
                         "  - lets the delegates finish: " + joined(delegates) + ",",
                         "  - and ends two minutes after the last of them."});
}

// The path of the setup application's bundle, below the root.
std::string bundlePath(const Session& session, const SetupArguments& arguments) {
    if (!arguments.bundle.empty()) {
        return arguments.bundle;
    }
    const std::string found = session.options.rootGiven ? std::string() : findSetupBundle();
    return found.empty() ? kSetupBundlePath : found;
}

Report setUp(Session& session, const SetupArguments& arguments) {
    const platform::Platform& platform = platform::current();
    std::optional<Answers> answers;
    std::optional<Terminal> terminal;
    if (arguments.answers.empty()) {
        terminal.emplace(kInsteadOfTerminal);
    } else {
        answers.emplace(arguments.answers);
    }
    const std::string path = bundlePath(session, arguments);
    if (!platform.fileSystem.exists(path)) {
        throw CommandFailure("there is no setup application at " + path +
                             (session.options.rootGiven ? " below " + session.options.root : "") +
                             " (see --bundle)");
    }
    SetupFlow::checkNothingIsWaiting(session.options.storesLocally);

    SetupFlow flow(session.log, !session.options.verbose);
    Decisions decisions;
    if (answers) {
        SetupFlow::checkWhoIsLoggedIn(answers->decisions.account);
        flow.signIn(answers->decisions.account,
                    getPassword(arguments.password, "Password for " + answers->decisions.account + ":"));
        answers->choose(flow.aliasOffers());
        decisions = answers->decisions;
    } else {
        terminal->say("This sets up your cloud account for the desktop.");
        decisions.account = signInAtTerminal(*terminal, flow, arguments.password);
        const std::vector<AliasOffer> offers = flow.aliasOffers();
        decisions.aliases = chooseAliases(*terminal, offers);
        decisions.services = chooseServices(*terminal);
        confirm(*terminal, offers, decisions);
    }
    flow.checkHandOver(decisions.aliases);
    flow.complete(decisions.services, decisions.justTheAccountAndKVS);
    const auto bundle = platform.resourceBundles.open(path);
    flow.handOver(decisions.aliases, *bundle);
    return result(decisions, flow);
}

} // namespace

void addSetupCommand(CommandLine& commandLine) {
    const auto arguments = std::make_shared<SetupArguments>();
    CLI::App& command = commandLine.addCommand(
        "setup",
        "Set up a cloud account as a setup application does: sign in, choose aliases and services, hand over "
        "to the agent of the next login",
        [arguments](Session& session) { return setUp(session, *arguments); });
    command
        .add_option(
            "--answers", arguments->answers,
            "Ask nothing but the password: a property list with Account and, where not everything is "
            "wanted, Services (an array of names or identifiers), Aliases (a dictionary from delegate "
            "identifier to an array) and JustTheAccountAndKVS (a boolean); - for stdin")
        ->type_name("PLIST");
    CommandLine::addPasswordOption(command, arguments->password);
    command
        .add_option("--bundle", arguments->bundle,
                    std::string("The setup application's bundle, looked up below --root [the one that comes "
                                "with the tool; below --root ") +
                        kSetupBundlePath + "]")
        ->type_name("DIR");
    commandLine.addLocalOption(command);
}

} // namespace welcomer::tool
