#include "tools/welcomer/plugins/PluginExamination.h"

#include "plugins/PluginContext.h"
#include "plugins/WLNimbusDelegatePlugins.h"
#include "text/Describe.h"
#include "tools/welcomer/cli/PropertyListFile.h"
#include "tools/welcomer/plugins/CheckProcess.h"
#include "tools/welcomer/plugins/PluginChecks.h"
#include "tools/welcomer/story/FolderCopy.h"
#include "tools/welcomer/story/PluginCopy.h"
#include "tools/welcomer/story/TemporaryFolder.h"
#include "tools/welcomer/terminal/Failure.h"

#include <map>

namespace welcomer::tool {

namespace {

namespace fs = std::filesystem;

Json recordOf(const PluginCheck& check, const char* verdict, const std::string& seen) {
    return {{"name", check.name},
            {"verdict", verdict},
            {"seen", seen.empty() ? Json() : Json(seen)},
            {"documented", check.documented}};
}

class Examination {
  public:
    Examination(const PlatformFactory& buildPlatform, const fs::path& file, const PropertyList& response,
                InterruptionGuard& guard)
        : _buildPlatform(buildPlatform),
          _guard(guard),
          _input{libraryOfPlugin(file), file.stem().string() + "." + kPluginExtension, response} {
        _install(file);
    }

    Json run() {
        Json records = Json::array();
        for (const PluginCheck& check : pluginChecks()) {
            records.push_back(_isReady(check) ? _make(check)
                                              : recordOf(check, kSkipped,
                                                         "it needs the check " + std::string(check.needs)));
            _verdicts[check.name] = records.back()["verdict"].get<std::string>();
        }
        return records;
    }

  private:
    // Below the temporary folder, where nobody else can write.
    void _install(const fs::path& file) {
        const fs::path folder = _folder.path() / fs::path(kPluginDirectory).relative_path();
        makeFolders(folder);
        if (fs::is_regular_file(file) || fs::is_directory(file)) {
            installPlugin(file, folder);
        }
    }

    bool _isReady(const PluginCheck& check) const {
        const auto needed = _verdicts.find(check.needs);
        return needed == _verdicts.end() || needed->second == kPassed || needed->second == kWarned;
    }

    Json _make(const PluginCheck& check) {
        const CheckOutcome outcome = runCheck(_buildPlatform, _folder.path().string(), _guard, check, _input);
        const char* const bad = check.severity == Severity::Failure ? kFailed : kWarned;
        return outcome.findings.empty() ? recordOf(check, kPassed, outcome.seen)
                                        : recordOf(check, bad, outcome.findings);
    }

    const PlatformFactory& _buildPlatform;
    InterruptionGuard& _guard;
    const CheckInput _input;
    const TemporaryFolder _folder;
    std::map<std::string_view, std::string> _verdicts;
};

} // namespace

fs::path libraryOfPlugin(const fs::path& plugin) {
    if (!fs::is_directory(plugin)) {
        return plugin;
    }
    try {
        const PropertyList info = readPropertyListFile((plugin / "Info.plist").string());
        const PropertyList* const name = info.find("Executable");
        return name && name->isString() ? plugin / *name->string() : plugin;
    } catch (const CommandFailure&) {
        return plugin;
    }
}

Json examinePlugin(const PlatformFactory& buildPlatform, const fs::path& file, const PropertyList& response,
                   InterruptionGuard& guard) {
    return Examination(buildPlatform, file, response, guard).run();
}

} // namespace welcomer::tool
