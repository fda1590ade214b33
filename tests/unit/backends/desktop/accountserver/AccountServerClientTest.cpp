// What the account server is asked, and what its answers come to.

#include "backends/accountserver/SignInAnswers.h"
#include "tests/unit/backends/desktop/accountserver/AccountServerFixture.h"

#include <thread>

namespace welcomer::desktop {
namespace {

using namespace platform;
using accountserver::ContentType;
using Dictionary = PropertyList::Dictionary;

TEST_F(AccountServerTest, ARequestHasTheUserThePasswordTheDelegatesRequestAndTheMachine) {
    StubServer& stub = serve(json(kRightAnswer));
    const Dictionary request{{"delegates", Dictionary{{"com.corvid.skylark", Dictionary{}}}}};
    EXPECT_TRUE(client().answer("anna", "se\"\\\n\xC3\xA9<&>", request).isCompleted);
    ASSERT_EQ(stub.requests().size(), 1U);
    const StubRequest came = stub.requests().front();
    EXPECT_EQ(came.line, "POST /v1/authenticate HTTP/1.1");
    EXPECT_NE(came.fields.find("Content-Type: application/json\r\n"), std::string::npos) << came.fields;
    EXPECT_NE(came.fields.find("application/x-plist"), std::string::npos) << came.fields;
    const auto read = accountserver::decodeAuthenticateRequest(came.body, ContentType::JSON);
    ASSERT_TRUE(read) << read.error;
    EXPECT_EQ(read.message->password, "se\"\\\n\xC3\xA9<&>");
    EXPECT_EQ(read.message->request.sender.user, "anna");
    EXPECT_EQ(read.message->request.sender.requestID.size(), 36U);
    EXPECT_EQ(read.message->request.sender.machine,
              (accountserver::Machine{"Debian GNU/Linux", "12", "C.UTF-8"}));
    EXPECT_EQ(read.message->request.delegatesRequest, request);
}

TEST_F(AccountServerTest, ARequestWithDataIsSentAsAPropertyList) {
    StubServer& stub = serve(json(kRightAnswer));
    const Dictionary request{{"delegates", Dictionary{{"d", PropertyList::Data{"\x01\xFF"}}}}};
    EXPECT_TRUE(client().answer("anna", "<&>", request).isCompleted);
    const auto read =
        accountserver::decodeAuthenticateRequest(stub.requests().at(0).body, ContentType::PropertyList);
    ASSERT_TRUE(read) << read.error;
    EXPECT_EQ(read.message->password, "<&>");
    EXPECT_EQ(read.message->request.delegatesRequest, request);
    EXPECT_NE(unavailability(client().answer("anna", "\x01", request)).find("the password holds a character"),
              std::string::npos);
}

TEST_F(AccountServerTest, EachRequestHasAnIDOfItsOwn) {
    StubServer& stub = serve(json(kRightAnswer));
    ask();
    ask();
    const auto idOf = [&](std::size_t i) {
        return accountserver::decodeAuthenticateRequest(stub.requests().at(i).body, ContentType::JSON)
            .message->request.sender.requestID;
    };
    EXPECT_NE(idOf(0), idOf(1));
}

TEST_F(AccountServerTest, ARightAnswerIsWhatTheNotificationSaysAndHasTheServicesOfTheAccount) {
    serve(json(kRightAnswer));
    const AccountServerClient asked = client();
    EXPECT_EQ(asked.servicesOfNewAccount("anna").size(), std::size(kSKServiceIDs));
    const SignInAnswer answer = asked.answer("anna", "secret", {});
    EXPECT_TRUE(answer.isCompleted);
    EXPECT_EQ(answer.contents,
              (Dictionary{{kStatusKey, 0},
                          {kSKPropertyAccountID, "anna"},
                          {kDelegatesKey, Dictionary{{"com.corvid.chatter", Dictionary{{"status", 0}}}}}}));
    EXPECT_EQ(
        asked.servicesOfNewAccount("anna"),
        (Dictionary{{kSKServiceIDMail, Dictionary{{"CanBeEnabled", false},
                                                  {"Properties", Dictionary{{kSKPropertyMailEmailAddress,
                                                                             "anna@example.org"}}}}}}));
    EXPECT_EQ(asked.servicesOfNewAccount("bert").size(), std::size(kSKServiceIDs));
}

TEST_F(AccountServerTest, EveryProblemIsTheAccountErrorOfItsType) {
    for (const accountserver::ProblemKind& kind : accountserver::kProblemKinds) {
        for (const ContentType type : {ContentType::JSON, ContentType::PropertyList}) {
            const accountserver::Problem problem{kind.type, "Why.", "", PropertyList("v2")};
            serve(httpAnswer(kind.httpStatus,
                             type == ContentType::JSON ? "application/problem+json" : "application/x-plist",
                             accountserver::encode(problem, type).value(), "Retry-After: 7\r\n"));
            const SignInAnswer answer = ask();
            EXPECT_FALSE(answer.isCompleted);
            EXPECT_EQ(answer.contents, accountserver::signInAnswerOf(problem, 7).contents) << kind.uri;
        }
    }
}

TEST_F(AccountServerTest, AnAnswerForAnotherUserIsNone) {
    serve(json(R"({"status": 0, "accountID": "bert"})"));
    EXPECT_EQ(unavailability(ask()), name() + " has answered for another user");
}

TEST_F(AccountServerTest, AnAnswerThatCannotBeKeptIsRefusedByName) {
    serve(json(R"({"status": 0, "accountID": "anna", "delegates": {"d": "\u0001"}})"));
    EXPECT_EQ(unavailability(ask()),
              "what " + name() +
                  " answers cannot be kept: answer/delegates/d holds U+0001, for which XML has no place");
}

TEST_F(AccountServerTest, AcceptedTermsAreSentAsTheyCame) {
    StubServer& stub = serve("HTTP/1.1 204 No Content\r\n\r\n");
    const Dictionary terms{{"version", 3}};
    EXPECT_TRUE(client().acceptTerms("anna", "secret", terms).isCompleted);
    EXPECT_EQ(stub.requests().at(0).line, "POST /v1/accept-terms HTTP/1.1");
    const auto read = accountserver::decodeAcceptTermsRequest(stub.requests().at(0).body, ContentType::JSON);
    ASSERT_TRUE(read) << read.error;
    EXPECT_EQ(read.message->request.terms, PropertyList(terms));
    serve(json(kRightAnswer));
    EXPECT_FALSE(client().acceptTerms("anna", "secret", terms).isCompleted);
}

TEST_F(AccountServerTest, LookingSendsNoPasswordAndTellsTheVersionAndTheClock) {
    const std::string description = R"({"server": "a server", "version": "1.2"})";
    StubServer& stub = serve(json(description));
    AccountServerLook look = client().look();
    EXPECT_EQ(look.text, "answers: a server 1.2, tells no time");
    EXPECT_TRUE(look.isRight);
    EXPECT_EQ(stub.requests().at(0).line, "GET /v1/server HTTP/1.1");
    EXPECT_EQ(stub.requests().at(0).body, "");

    serve(httpAnswer(200, "application/json", description, "Date: Tue, 01 Jan 2030 00:00:00 GMT\r\n"));
    look = client().look();
    EXPECT_NE(look.text.find(" s ahead"), std::string::npos) << look.text;
    EXPECT_EQ(look.advice, "set this machine's clock, or the server's");
    EXPECT_FALSE(look.isRight);

    serve(httpAnswer(404, "text/plain", "no"));
    look = client().look();
    EXPECT_EQ(look.text, name() + " does not speak the account server's protocol: HTTP status 404");
    EXPECT_FALSE(look.isRight);
}

TEST_F(AccountServerTest, AServerThatComesUpWhileItIsTriedAgainIsAskedOnce) {
    std::thread later([this] {
        std::this_thread::sleep_for(std::chrono::milliseconds(100)); // what is waited for is the next try
        serve(json(kRightAnswer));
    });
    const SignInAnswer answer = ask();
    later.join();
    EXPECT_TRUE(answer.isCompleted);
    EXPECT_EQ(server->requests().size(), 1U);
}

TEST_F(AccountServerTest, AServerThatIsNotThereIsNamed) {
    EXPECT_EQ(unavailability(ask()),
              "no account server listens on " + name() + ": No such file or directory");
}

TEST_F(AccountServerTest, ARequestThatWasCarriedIsNotSentAgain) {
    StubServer& stub = serve(std::string());
    EXPECT_NE(unavailability(ask()).find("the connection to " + name() + " broke off"), std::string::npos);
    EXPECT_EQ(stub.requests().size(), 1U);
}

TEST_F(AccountServerTest, AServerThatIsSilentIsGivenUp) {
    std::atomic<bool> isOver = false;
    serve([&](const StubRequest&) {
        while (!isOver) {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        return std::string();
    });
    EXPECT_EQ(unavailability(client(std::chrono::seconds(1)).answer("anna", "secret", {})),
              name() + " has not answered within 1 s");
    isOver = true;
    server.reset(); // which still asks whether it is over
}

TEST_F(AccountServerTest, WhatIsAskedEndsWhenTheClientIsStopped) {
    std::atomic<bool> isAsked = false;
    std::atomic<bool> isOver = false;
    serve([&](const StubRequest&) {
        isAsked = true;
        while (!isOver) {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        return std::string();
    });
    AccountServerClient asked = client(std::chrono::seconds(900));
    std::thread stopper([&] {
        while (!isAsked) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        asked.stop();
    });
    EXPECT_NE(unavailability(asked.answer("anna", "secret", {})).find("the program ended"),
              std::string::npos);
    stopper.join();
    isOver = true;
    EXPECT_FALSE(asked.answer("anna", "secret", {}).isCompleted);
    server.reset(); // which still asks whether it is over
}

} // namespace
} // namespace welcomer::desktop
