#include "tools/welcomer/checks/PluginCheck.h"

#include "backends/posix/Strangers.h"
#include "platform/Path.h"
#include "platform/Platform.h"
#include "tools/welcomer/checks/ChildOutput.h"

#include <nlohmann/json.hpp>

namespace welcomer::tool {

namespace {

using namespace std::chrono_literals;

constexpr char kSubject[] = "plug-ins";
constexpr auto kLimit = 60s; // for loading all of them

// The files of the folder, and what is in those that are folders themselves.
std::vector<std::string> entriesOf(const std::string& folder) {
    platform::FileSystem& files = platform::current().fileSystem;
    std::vector<std::string> paths;
    for (const std::string& name : files.list(folder).value_or(std::vector<std::string>())) {
        const std::string path = platform::joinPath(folder, name);
        paths.push_back(path);
        for (const std::string& inner : files.list(path).value_or(std::vector<std::string>())) {
            paths.push_back(platform::joinPath(path, inner));
        }
    }
    return paths;
}

void addStrangers(Findings& findings, const posix::RootFolder& root, const std::string& folder) {
    std::vector<std::string> paths = entriesOf(folder);
    paths.insert(paths.begin(), folder);
    std::string last; // a folder is on the way to everything in it
    for (const std::string& path : paths) {
        const std::string stranger = posix::strangerWhoMayChange(root, path, false);
        if (!stranger.empty() && stranger != last) {
            findings.push_back({kSubject, Verdict::Wrong, stranger,
                                "give it to root alone: chown root:root and chmod go-w"});
        }
        last = stranger;
    }
}

// What the tool itself says when it loads them.
Findings loadAll(const Options& options) {
    std::vector<std::string> command{"/proc/self/exe", "--json", "plugins", "list"};
    if (options.rootGiven) {
        command.insert(command.end(), {"--root", options.root});
    }
    const ChildOutput output = outputOf(command, kLimit);
    const Json document = Json::parse(output.text, nullptr, false);
    if (!output.trouble.empty() || !document.is_object() || !document.contains("plugins")) {
        return {{kSubject, Verdict::Wrong,
                 "the plug-ins cannot be loaded" + (output.trouble.empty() ? "" : ": " + output.trouble),
                 "see which one it is with: welcomer plugins list"}};
    }
    Findings findings;
    for (const Json& plugin : document["plugins"]) {
        const std::string state = plugin["state"];
        if (state != "loaded") {
            findings.push_back({kSubject, Verdict::Wrong, plugin["file"].get<std::string>() + ": " + state,
                                "install another version of it, or remove it"});
        }
    }
    if (findings.empty()) {
        findings.push_back(
            {kSubject, Verdict::Right, "all load: " + std::to_string(document["plugins"].size())});
    }
    return findings;
}

} // namespace

Findings checkPlugins(const Options& options, const std::string& folder) {
    if (!platform::current().fileSystem.exists(folder)) {
        return {{kSubject, Verdict::Right, "there are none: no folder " + folder}};
    }
    Findings findings{{kSubject, Verdict::Right, "they are in " + folder}};
    const std::size_t before = findings.size();
    addStrangers(findings, posix::RootFolder(options.root), folder);
    if (findings.size() > before) {
        findings.push_back(
            {kSubject, Verdict::Unknown,
             "they are not loaded: what others may change would run with the rights of this process"});
        return findings;
    }
    const Findings loaded = loadAll(options);
    findings.insert(findings.end(), loaded.begin(), loaded.end());
    return findings;
}

} // namespace welcomer::tool
