// The account service with an account server in the machine's directory's place; what it keeps is asserted in the
// contract's header.

#include "backends/desktop/accountserver/AccountServerClient.h"
#include "tests/contract/AccountServiceContract.h"
#include "tests/contract/LocalAccounts.h"
#include "tests/support/StubServer.h"

#include <map>

namespace welcomer::contract {
namespace {

// A server that knows names and passwords.
struct AccountServerBackend {
    AccountServerBackend() { root.addDirectory("/home/user/Library"); }
    ~AccountServerBackend() { client.stop(); }

    // A server tells what services an account has once the password has been right: setup makes none before that.
    void addUser(const std::string& name, const std::string& password) {
        passwords[name] = password;
        EXPECT_TRUE(client.answer(name, password, {}).isCompleted);
    }

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

    LocalTime time;
    TemporaryRoot root;
    std::map<std::string, std::string> passwords;
    StubServer server{root.locate("/socket"), [this](const StubRequest& request) {
                          return reply(request);
                      }};
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

INSTANTIATE_TYPED_TEST_SUITE_P(AccountServer, AccountServiceContract, AccountServerBackend);

} // namespace
} // namespace welcomer::contract
