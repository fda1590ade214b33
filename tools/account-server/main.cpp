// welcomer-account-server, a system service: tells machines whether somebody may sign in, over HTTP.

#include "backends/accountserver/Protocol.h"
#include "backends/local/LocalSystemLog.h"
#include "backends/local/accounts/NimbusDirectory.h"
#include "backends/posix/RootFolder.h"
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
#include <string_view>
#include <sys/prctl.h>
#include <system_error>
#include <unistd.h>
#include <vector>

using namespace welcomer;

namespace {

#ifdef WELCOMER_LDAP
std::unique_ptr<server::AccountSource> makeLdapSource(const posix::RootFolder& root,
                                                      const server::LdapSettings& settings,
                                                      platform::SystemLog& log) {
    std::string password;
    const std::string& file = settings.searchPasswordFile;
    if (!file.empty()) {
        if (const int error = posix::readFile(root, file, password, 4096)) {
            throw std::runtime_error(root.shown(file) + ": " + std::generic_category().message(error));
        }
        password.erase(password.find_last_not_of("\r\n") + 1);
    }
    return std::make_unique<server::LdapSource>(
        settings, password, [&log](const std::string& line) { log.write(platform::kErrorPriority, line); });
}
#else
std::unique_ptr<server::AccountSource> makeLdapSource(const posix::RootFolder& /*root*/,
                                                      const server::LdapSettings& /*settings*/,
                                                      platform::SystemLog& /*log*/) {
    throw std::runtime_error("Source=ldap: it was built without libldap");
}
#endif

class StandardErrorLog final : public platform::SystemLog {
  public:
    void write(int /*priority*/, const std::string& message) override {
        std::fputs((message + "\n").c_str(), stderr);
    }
};

// Below another root than "/" nobody hands a socket over, and the machine's log has nothing to do with it.
class Surroundings {
  public:
    explicit Surroundings(const std::string& folder)
        : root(folder),
          _socket(root.isWholeMachine() ? "" : root.shown(accountserver::kSocketPath)) {}
    ~Surroundings() { ::unlink(_socket.c_str()); }
    Surroundings(const Surroundings&) = delete;
    Surroundings& operator=(const Surroundings&) = delete;

    std::vector<server::ListeningSocket> sockets() const {
        return root.isWholeMachine() ? server::takeListeningSockets() : server::openListeningSocket(_socket);
    }
    platform::SystemLog& log() {
        return root.isWholeMachine() ? static_cast<platform::SystemLog&>(_systemLog) : _standardErrorLog;
    }

    const posix::RootFolder root;

  private:
    const std::string _socket; // of its own; empty where it has none
    local::LocalSystemLog _systemLog;
    StandardErrorLog _standardErrorLog;
};

} // namespace

int main(int argc, char** argv) {
    const bool hasRoot = argc == 3 && std::string_view(argv[1]) == "--root";
    if (argc > 1 && !hasRoot) {
        return answerOption(argv[1], "welcomer-account-server", "[--root DIR]");
    }
    // Passwords pass through here: nobody looks into the memory, and what the libraries give back is written over.
    ::prctl(PR_SET_DUMPABLE, 0);
    ::mallopt(M_PERTURB, 1);
    // A long body is the machine's again as soon as it is gone; the library would keep room for the next one.
    ::mallopt(M_MMAP_THRESHOLD, 128 * 1024);
    // systemd's name for the folder of the service.
    const char* const folder = std::getenv("STATE_DIRECTORY");
    // The settings of the server hold, and no others on the machine.
    ::setenv("LDAPNOINIT", "1", 1);
    Surroundings surroundings(hasRoot ? argv[2] : "/");
    const posix::RootFolder& root = surroundings.root;
    platform::SystemLog& log = surroundings.log();
    const local::NimbusDirectory directory(root);
    const auto makeSource = [&](const server::Settings& settings) -> std::unique_ptr<server::AccountSource> {
        if (settings.source == server::Settings::Source::LDAP) {
            return makeLdapSource(root, settings.ldap, log);
        }
        return std::make_unique<server::DirectorySource>(directory,
                                                         server::AcceptedTerms(folder ? folder : ""));
    };
    try {
        server::AccountServer(surroundings.sockets(), root, makeSource, log).run();
        return 0;
    } catch (const std::exception& error) {
        std::fprintf(stderr, "welcomer-account-server: %s\n", error.what());
        return 1;
    }
}
