// welcomer try: the whole story, from the setup to the end of the second login, in a fresh folder.

#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/story/Story.h"
#include "tools/welcomer/story/TemporaryFolder.h"

#include <CLI/CLI.hpp>
#include <memory>

namespace welcomer::tool {

namespace {

Report tellInFolder(Session& session, bool timeLapse, InterruptionGuard& guard) {
    if (session.options.rootGiven) {
        return tellStory(session, timeLapse, session.options.root, guard);
    }
    const TemporaryFolder temporary;
    return tellStory(session, timeLapse, temporary.path(), guard);
}

Report tryStory(Session& session, bool timeLapse) {
    const Options& options = session.options;
    if (options.rootGiven && options.root == "/") {
        throw UsageError("--root: the story needs a folder of its own, not the machine's own root");
    }
    // Before anything is made that an interruption would leave behind.
    InterruptionGuard guard;
    try {
        Report report = tellInFolder(session, timeLapse, guard);
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
    const auto timeLapse = std::make_shared<bool>(false);
    CLI::App& command = commandLine.addCommand(
        "try", "Walk the whole story in a fresh folder (or below --root), from the setup to the second login",
        [timeLapse](Session& session) { return tryStory(session, *timeLapse); });
    command.add_flag("--time-lapse", *timeLapse,
                     "Run the agent on simulated time: the two minutes pass at once");
}

} // namespace welcomer::tool
