// welcomer setup: a first-run flow for the terminal, and the reference of what a setup application does.

#include "cloud/WLNimbusServiceCatalogue.h"
#include "handoff/LaunchAgentFile.h"
#include "platform/Platform.h"
#include "propertylist/Lookup.h"
#include "text/Describe.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/story/HandOver.h"
#include "tools/welcomer/story/ServiceStates.h"
#include "tools/welcomer/story/SetupAnswers.h"
#include "tools/welcomer/story/SetupBundle.h"
#include "tools/welcomer/story/SetupFlow.h"
#include "tools/welcomer/terminal/Password.h"
#include "tools/welcomer/terminal/Terminal.h"

#include <algorithm>
#include <cstdlib>
#include <memory>
#include <optional>
#include <unistd.h>
#include <utility>

namespace welcomer::tool {

namespace {

constexpr int kSignInAttempts = 3;
constexpr const char* kInsteadOfTerminal = "--answers PLIST";

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

struct SetupArguments {
    std::string answers;
    std::string bundle; // empty: the one that comes with the tool
    PasswordSource password;
    std::shared_ptr<SetupAnswers> read;         // what the file holds; null without one
    std::optional<posix::SecretText> firstLine; // the password, where both come from the standard input
    bool cancels = false;
};

std::string askForAccount(Terminal& terminal) {
    std::string account;
    while (account.empty()) {
        account = terminal.ask("Your cloud account's name:");
    }
    SetupFlow::checkWhoIsLoggedIn(account);
    return account;
}

// Shows what is to be accepted and asks whether it is. Of an object people are shown the text and the address
// in it.
bool acceptsTerms(Terminal& terminal, const PropertyList& terms) {
    terminal.say("");
    terminal.say("The terms of service are to be accepted first:");
    bool isShown = false;
    for (const char* const key : {"text", "url"}) {
        if (const std::string* const line = textIn(terms, key)) {
            terminal.say(*line);
            isShown = true;
        }
    }
    if (!isShown) {
        terminal.say(text::describe(terms));
    }
    return terminal.confirm("Do you accept them?");
}

// Signs in; terms of service that are to be accepted first are offered, once.
void signInOrAccept(Terminal& terminal, SetupFlow& flow, const platform::SignInDirectory& directory,
                    const std::string& account, const std::string& password) {
    try {
        flow.signIn(account, password);
    } catch (const SignInFailure& failure) {
        if (!failure.terms() || !acceptsTerms(terminal, *failure.terms())) {
            throw;
        }
        flow.acceptTerms(directory, *failure.terms());
        flow.signIn(account, password);
    }
}

// Asks at the terminal until somebody is signed in; what may have been mistyped is asked for again.
std::string signInAtTerminal(Terminal& terminal, SetupFlow& flow, const platform::SignInDirectory& directory,
                             const PasswordSource& source) {
    std::string account = askForAccount(terminal);
    for (int attempt = 1;; ++attempt) {
        const posix::SecretText password = getPassword(source, "Password for " + account + ":");
        try {
            signInOrAccept(terminal, flow, directory, account, password.text());
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

Report result(const Decisions& decisions, SetupFlow& flow, const std::string& server) {
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
    report.document = {
        {"account", decisions.account},     {"server", server.empty() ? Json() : Json(server)},
        {"services", toJson(states)},       {"aliases", decisions.aliases},
        {"launchAgent", kLaunchAgentLabel}, {"atNextLogin", {{"services", later}, {"delegates", delegates}}}};
    report.lines({"", decisions.account + " is set up.", ""});
    addServiceTable(report, report.document["services"], "  ");
    return report.lines({"", "At the next login the agent starts, once. It",
                         "  - turns on " + namesOf(later) + ",",
                         "  - lets the delegates finish: " + joined(delegates) + ",",
                         "  - and ends two minutes after the last of them."});
}

// Who was given root's rights for this command alone, through pkexec, cannot use them for anything else: not
// for root itself, and not on files of one's own choice.
void refuseMoreThanAnotherUser(const Options& options, const SetupArguments& arguments) {
    if (!std::getenv("PKEXEC_UID")) {
        return;
    }
    if (options.user.empty()) {
        throw UsageError("through pkexec a setup is for another user: --user NAME");
    }
    const bool namesFiles = !arguments.answers.empty() && arguments.answers != "-";
    if (options.rootGiven || !arguments.bundle.empty() || namesFiles) {
        throw UsageError("through pkexec there is no --root, no --bundle, and no file for --answers but -");
    }
}

void prepare(const Options& options, SetupArguments& arguments) {
    refuseMoreThanAnotherUser(options, arguments);
    arguments.bundle = systemPath(options, "--bundle", arguments.bundle);
    if (arguments.answers == "-" && arguments.password == STDIN_FILENO) {
        arguments.firstLine = getPassword(arguments.password, "");
    }
    if (!arguments.answers.empty()) {
        arguments.read = std::make_shared<SetupAnswers>(arguments.answers);
    }
}

Report cancel(Session& session) {
    const WaitingSetup there = cancelHandOver(session.log);
    const bool hadItem = there.hasItem();
    return Report(
        {{"item", hadItem}, {"agent", there.hasAgent}},
        std::string("Removed ") + (hadItem ? "the replay item" : "") +
            (hadItem && there.hasAgent ? " and " : "") + (there.hasAgent ? "the agent" : "") +
            ": nothing happens at the next login. The account stays as it is (see welcomer account).");
}

Report setUp(Session& session, const SetupArguments& arguments) {
    if (arguments.cancels) {
        return cancel(session);
    }
    const std::shared_ptr<SetupAnswers>& answers = arguments.read;
    std::optional<Terminal> terminal;
    if (!answers) {
        terminal.emplace(kInsteadOfTerminal);
    }
    const auto bundle = openSetupBundle(session.options, arguments.bundle);
    refuseWhereSomethingIsWaiting({session.options.user, session.options.storesLocally});

    SetupFlow flow(session.log, !session.options.verbose);
    const std::string server = session.signInDirectory.server();
    Decisions decisions;
    if (answers) {
        SetupFlow::checkWhoIsLoggedIn(answers->decisions.account);
        tellAskedServer(session);
        const std::string& account = answers->decisions.account;
        const posix::SecretText password =
            arguments.firstLine ? *arguments.firstLine
                                : getPassword(arguments.password, "Password for " + account + ":");
        flow.signIn(account, password.text());
        answers->choose(flow.aliasOffers());
        decisions = answers->decisions;
    } else {
        terminal->say("This sets up your cloud account for the desktop.");
        if (!server.empty()) {
            terminal->say("Your name and password go to the account server " + server);
        }
        decisions.account = signInAtTerminal(*terminal, flow, session.signInDirectory, arguments.password);
        const std::vector<AliasOffer> offers = flow.aliasOffers();
        decisions.aliases = chooseAliases(*terminal, offers);
        decisions.services = chooseServices(*terminal);
        confirm(*terminal, offers, decisions);
    }
    flow.checkHandOver(decisions.aliases);
    flow.complete(decisions.services, decisions.justTheAccountAndKVS);
    flow.handOver(decisions.aliases, *bundle);
    return result(decisions, flow, server);
}

} // namespace

void addSetupCommand(CommandLine& commandLine) {
    const auto arguments = std::make_shared<SetupArguments>();
    CommandLevel command = commandLine.addCommand(
        "setup",
        "Set up a cloud account as a setup application does: sign in, choose aliases and services, hand over "
        "to the agent of the next login",
        [arguments](Session& session) { return setUp(session, *arguments); });
    command
        .option(
            "--answers", arguments->answers,
            "Ask nothing but the password: a property list with Account and, where not everything is "
            "wanted, Services (an array of names or identifiers), Aliases (a dictionary from delegate "
            "identifier to an array) and JustTheAccountAndKVS (a boolean); - for stdin, where the password's "
            "line comes first with --password-fd 0")
        .called("PLIST");
    CommandLine::addPasswordOption(command, arguments->password);
    addBundleOption(command, arguments->bundle);
    command
        .flag("--cancel", arguments->cancels,
              "Take back what a setup has left for the next login: the replay item and the agent")
        .excludes("--answers")
        .excludes("--password-fd")
        .excludes("--bundle");
    commandLine.addLocalOption(command);
    commandLine.addUserOption(command);
    commandLine.addPreparation(command,
                               [arguments](const Options& options) { prepare(options, *arguments); });
}

} // namespace welcomer::tool
