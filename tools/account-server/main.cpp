// welcomer-account-server, a system service: tells machines whether somebody may sign in, over HTTP.

#include "backends/local/LocalSystemLog.h"
#include "backends/local/accounts/NimbusDirectory.h"
#include "text/ProgramOptions.h"
#include "tools/account-server/AccountServer.h"
#include "tools/account-server/DirectorySource.h"
#ifdef WELCOMER_LDAP
#include "backends/posix/FileContent.h"
#include "tools/account-server/LdapSource.h"
#endif

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <malloc.h>
#include <memory>
#include <stdexcept>
#include <string>
#include <sys/prctl.h>
#include <system_error>

using namespace welcomer;

namespace {

#ifdef WELCOMER_LDAP
std::unique_ptr<server::AccountSource> makeLdapSource(const server::LdapSettings& settings,
                                                      platform::SystemLog& log) {
    std::string password;
    const std::string& file = settings.searchPasswordFile;
    if (!file.empty()) {
        if (const int error = posix::readFile(posix::RootFolder("/"), file, password, 4096)) {
            throw std::runtime_error(file + ": " + std::generic_category().message(error));
        }
        password.erase(password.find_last_not_of("\r\n") + 1);
    }
    return std::make_unique<server::LdapSource>(
        settings, password, [&log](const std::string& line) { log.write(platform::kErrorPriority, line); });
}
#else
std::unique_ptr<server::AccountSource> makeLdapSource(const server::LdapSettings& /*settings*/,
                                                      platform::SystemLog& /*log*/) {
    throw std::runtime_error("Source=ldap: it was built without libldap");
}
#endif

} // namespace

int main(int argc, char** argv) {
    if (argc > 1) {
        return answerOption(argv[1], "welcomer-account-server", "");
    }
    // Passwords pass through here: nobody looks into the memory, and what the libraries give back is written over.
    ::prctl(PR_SET_DUMPABLE, 0);
    ::mallopt(M_PERTURB, 1);
    // systemd's name for the folder of the service.
    const char* const folder = std::getenv("STATE_DIRECTORY");
    // The settings of the server hold, and no others on the machine.
    ::setenv("LDAPNOINIT", "1", 1);
    local::LocalSystemLog log;
    const local::NimbusDirectory directory{posix::RootFolder("/")};
    const auto makeSource = [&](const server::Settings& settings) -> std::unique_ptr<server::AccountSource> {
        if (settings.source == server::Settings::Source::LDAP) {
            return makeLdapSource(settings.ldap, log);
        }
        return std::make_unique<server::DirectorySource>(directory,
                                                         server::AcceptedTerms(folder ? folder : ""));
    };
    try {
        server::AccountServer(server::takeListeningSockets(), server::kSettingsFile, makeSource, log).run();
        return 0;
    } catch (const std::exception& error) {
        std::fprintf(stderr, "welcomer-account-server: %s\n", error.what());
        return 1;
    }
}
