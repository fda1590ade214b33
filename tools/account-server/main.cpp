// welcomer-account-server, a system service: tells machines whether somebody may sign in, over HTTP.

#include "backends/local/LocalSystemLog.h"
#include "backends/local/accounts/NimbusDirectory.h"
#include "text/ProgramOptions.h"
#include "tools/account-server/AccountServer.h"
#include "tools/account-server/DirectorySource.h"

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <memory>
#include <stdexcept>
#include <string>
#include <sys/prctl.h>

using namespace welcomer;

int main(int argc, char** argv) {
    if (argc > 1) {
        return answerOption(argv[1], "welcomer-account-server", "");
    }
    ::prctl(PR_SET_DUMPABLE, 0); // passwords pass through here
    // systemd's name for the folder of the service.
    const char* const folder = std::getenv("STATE_DIRECTORY");
    const local::NimbusDirectory directory{posix::RootFolder("/")};
    const auto makeSource = [&](const server::Settings& settings) -> std::unique_ptr<server::AccountSource> {
        if (settings.source == server::Settings::Source::LDAP) {
            throw std::runtime_error("Source=ldap is not built in");
        }
        return std::make_unique<server::DirectorySource>(directory,
                                                         server::AcceptedTerms(folder ? folder : ""));
    };
    local::LocalSystemLog log;
    try {
        server::AccountServer(server::takeListeningSockets(), server::kSettingsFile, makeSource, log).run();
        return 0;
    } catch (const std::exception& error) {
        std::fprintf(stderr, "welcomer-account-server: %s\n", error.what());
        return 1;
    }
}
