// The account service with an account server in the machine's directory's place: one in this process, and the one
// that was built. What it keeps is asserted in the contract's header.

#include "backends/desktop/accountserver/AccountServerClient.h"
#include "tests/contract/AccountServiceContract.h"
#include "tests/contract/LocalAccounts.h"
#include "tests/support/AccountServerProcess.h"
#include "tests/support/StubServer.h"

#include <map>
#include <type_traits>

namespace welcomer::contract {
namespace {

// A server that knows names and passwords, within this process.
struct ServerHere {
    explicit ServerHere(const std::string& socket)
        : server(socket, [this](const StubRequest& request) { return reply(request); }) {}

    void addUser(const std::string& name, const std::string& password) { passwords[name] = password; }

    std::string reply(const StubRequest& request) const {
        using namespace accountserver;
        const auto read = decodeAuthenticateRequest(request.body, ContentType::JSON);
        if (!read) {
            return failure(ProblemType::InvalidRequest);
        }
        const std::string& user = read.message->request.sender.user;
        const auto found = passwords.find(user);
        if (found == passwords.end() || found->second != read.message->password) {
            return failure(found == passwords.end() ? ProblemType::UnknownUser : ProblemType::WrongPassword);
        }
        const AuthenticateAnswer answer{0, user, PropertyList::Dictionary{}, "anna@example.org",
                                        std::map<std::string, AccountServiceEntry>{
                                            {kSKServiceIDContacts, {}}, {kSKServiceIDMail, {false}}}};
        return httpAnswer(200, kJSONContentType, encode(answer, ContentType::JSON).value());
    }

    static std::string failure(accountserver::ProblemType type) {
        return httpAnswer(
            accountserver::kindOf(type).httpStatus, accountserver::kProblemContentType,
            accountserver::encode(accountserver::Problem{type}, accountserver::ContentType::JSON).value());
    }

    std::map<std::string, std::string> passwords;
    StubServer server;
};

#ifdef WELCOMER_ACCOUNT_SERVER
// The account server that was built, with a directory file.
struct BuiltServer {
    explicit BuiltServer(const std::string& socket) : _socket(socket) {
        _machine.root.addDirectory("/etc");
        _machine.root.addDirectory("/var/lib");
    }

    // The server reads the file with each question.
    void addUser(const std::string& name, const std::string& password) {
        _machine.addUser(name, password);
        if (!_server) {
            _server = std::make_unique<AccountServerProcess>(WELCOMER_ACCOUNT_SERVER, _machine.root.path(),
                                                             _socket);
        }
    }

  private:
    const std::string _socket;
    LocalAccounts<LocalTime> _machine; // the server's
    std::unique_ptr<AccountServerProcess> _server;
};
#endif

template <class Server>
struct AccountServerBackend {
    AccountServerBackend() { root.addDirectory("/home/user/Library"); }
    ~AccountServerBackend() { client.stop(); }

    // A server tells what services an account has once the password has been right: setup makes none before that.
    void addUser(const std::string& name, const std::string& password) {
        server.addUser(name, password);
        EXPECT_TRUE(client.answer(name, password, {}).isCompleted);
    }

    LocalTime time;
    TemporaryRoot root;
    Server server{root.locate("/socket")};
    desktop::AccountServerClient client{
        {[this] { return desktop::AccountServerSettings{"unix:" + root.locate("/socket")}; },
         [] {
             return accountserver::Machine{};
         }}};
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    local::LocalNotificationCenter center;
    fakes::FakeSystemLog log{recorder};
    local::LocalAccountService service{
        posix::RootFolder(root.path()), identity, time.runLoops, time.dispatchQueues, center, log, &client};
};

struct ServerNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, AccountServerBackend<ServerHere>> ? "Here" : "Built";
    }
};

#ifdef WELCOMER_ACCOUNT_SERVER
using Servers = testing::Types<AccountServerBackend<ServerHere>, AccountServerBackend<BuiltServer>>;
#else
using Servers = testing::Types<AccountServerBackend<ServerHere>>;
#endif
INSTANTIATE_TYPED_TEST_SUITE_P(AccountServer, AccountServiceContract, Servers, ServerNames);

} // namespace
} // namespace welcomer::contract
