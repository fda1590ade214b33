// welcomer try: the whole story, from the setup to the end of the second login, in a fresh folder.

#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/login/LoginPicture.h"
#include "tools/welcomer/story/DelegateResponses.h"
#include "tools/welcomer/story/ExampleServer.h"
#include "tools/welcomer/story/Story.h"
#include "tools/welcomer/story/TemporaryFolder.h"

#include <filesystem>
#include <memory>
#include <string>
#include <vector>

namespace welcomer::tool {

namespace {

struct TryArguments {
    bool timeLapse = false;
    bool withServer = false;
    std::string picture;
    std::vector<std::string> plugins;
    std::vector<std::string> responses;
};

StoryOptions storyOptions(const TryArguments& arguments) {
    StoryOptions options{arguments.timeLapse,
                         arguments.withServer ? findAccountServer() : std::filesystem::path(),
                         {},
                         readDelegateResponses(arguments.responses)};
    for (const std::string& plugin : arguments.plugins) {
        if (!std::filesystem::exists(plugin)) {
            throw CommandFailure("there is no file " + plugin);
        }
        options.plugins.push_back(std::filesystem::absolute(plugin));
    }
    return options;
}

Report tellInFolder(Session& session, const StoryOptions& story, InterruptionGuard& guard,
                    LoginRecord& firstLogin) {
    if (session.options.rootGiven) {
        return tellStory(session, story, session.options.root, guard, firstLogin);
    }
    const TemporaryFolder temporary;
    return tellStory(session, story, temporary.path(), guard, firstLogin);
}

Report tryStory(Session& session, const TryArguments& arguments) {
    const Options& options = session.options;
    if (options.rootGiven && options.root == "/") {
        throw UsageError("--root: the story needs a folder of its own, not the machine's own root");
    }
    const StoryOptions story = storyOptions(arguments);
    // Before anything is made that an interruption would leave behind.
    InterruptionGuard guard;
    try {
        LoginRecord firstLogin;
        Report report = tellInFolder(session, story, guard, firstLogin);
        if (!arguments.picture.empty()) {
            writePicture(arguments.picture,
                         drawLogin(firstLogin, {"The first login of " + firstLogin.account(),
                                                arguments.timeLapse ? "on simulated time" : ""}));
            report.line("").line("The first login is drawn in " + arguments.picture + ".");
        }
        if (!report.failure) {
            report.line("").line(options.rootGiven ? options.root + " is left as it is."
                                                   : "The temporary folder is removed.");
        }
        return report;
    } catch (const Interrupted&) {
        guard.release(); // the signal takes its course here
        throw CommandFailure("interrupted");
    }
}

} // namespace

void addTryCommand(CommandLine& commandLine) {
    const auto arguments = std::make_shared<TryArguments>();
    CommandLevel command = commandLine.addCommand(
        "try", "Walk the whole story in a fresh folder (or below --root), from the setup to the second login",
        [arguments](Session& session) { return tryStory(session, *arguments); });
    command.flag("--time-lapse", arguments->timeLapse,
                 "Run the agent on simulated time: the two minutes pass at once");
    command.flag(
        "--server", arguments->withServer,
        "Sign in with the account server, which is started for it in the same folder and asked over a "
        "Unix socket");
    command
        .option("--picture", arguments->picture, "Draw the timeline of the first login in this file, as SVG")
        .called("FILE");
    command
        .option("--plugin", arguments->plugins,
                "A plug-in that takes part beside the examples; may be given several times")
        .called("FILE")
        .repeated();
    command
        .option("--response", arguments->responses,
                "What the server answers a delegate, a property list; may be given several times")
        .called("ID=PLIST")
        .repeated();
}

} // namespace welcomer::tool
