// Servers that mean harm, or nothing that makes sense: each costs one text, and no more memory or time than
// there is room for.

#include "tests/unit/backends/desktop/accountserver/AccountServerFixture.h"

#include <atomic>
#include <string>

namespace welcomer::desktop {
namespace {

TEST_F(AccountServerTest, AnAnswerThatBreaksOffAtAnyByteIsNone) {
    const std::string whole = json(kRightAnswer);
    std::atomic<std::size_t> size = 0;
    serve([&](const StubRequest&) { return whole.substr(0, size); });
    const AccountServerClient asked = client();
    for (; size < whole.size(); ++size) {
        EXPECT_NE(unavailability(asked.answer("anna", "secret", {})).find(" broke off ("), std::string::npos)
            << size;
    }
    EXPECT_EQ(server->requests().size(), whole.size()) << "each was asked once";
    EXPECT_TRUE(asked.answer("anna", "secret", {}).isCompleted);
}

TEST_F(AccountServerTest, AChunkedAnswerThatBreaksOffIsNone) {
    const std::string body = R"({"status": 0, "accountID": "anna"})";
    const std::string head =
        "HTTP/1.1 200 OK\r\nContent-Type: application/json\r\nTransfer-Encoding: chunked\r\n\r\n";
    serve(head + "22\r\n" + body + "\r\n0\r\n\r\n");
    EXPECT_TRUE(ask().isCompleted);
    serve(head + "22\r\n" + body + "\r\n");
    EXPECT_NE(unavailability(ask()).find("broke off"), std::string::npos);
}

TEST_F(AccountServerTest, AnAnswerThatIsTooLongIsBrokenOff) {
    const std::string tooLong = "the answer of " + name() + " is too long";
    const std::string blanks(accountserver::kMaximumBodySize + 1, ' ');
    serve(json(blanks));
    EXPECT_EQ(unavailability(ask()), tooLong);
    serve("HTTP/1.1 200 OK\r\nContent-Type: application/json\r\n\r\n" + blanks); // as long as the connection
    EXPECT_EQ(unavailability(ask()), tooLong);
    std::string fields;
    while (fields.size() < 100'000) {
        fields += "X-More: " + std::string(1000, 'x') + "\r\n";
    }
    serve(httpAnswer(200, "application/json", kRightAnswer, fields));
    EXPECT_EQ(unavailability(ask()), tooLong);
}

TEST_F(AccountServerTest, WhatIsNoAnswerOfTheProtocolIsToldWithWhatIsWrong) {
    const std::string stranger = name() + " does not speak the account server's protocol: ";
    const auto sayOf = [&](const std::string& answer) {
        serve(answer);
        return unavailability(ask());
    };
    EXPECT_EQ(sayOf(json("{}")), stranger + "the member status is missing");
    EXPECT_EQ(sayOf(json("[]")), stranger + "the body is no object");
    EXPECT_EQ(sayOf(json("nonsense")), stranger + "line 1, column 2: this is not JSON");
    EXPECT_EQ(sayOf(json(R"({"status": "0", "accountID": "anna"})")),
              stranger + "the member status is no integer");
    EXPECT_EQ(sayOf(json(R"({"status": 0, "status": 0, "accountID": "anna"})")),
              stranger + "status appears twice");
    EXPECT_EQ(sayOf(json(R"({"status": 99999999999999999999, "accountID": "anna"})")),
              stranger + "status is an integer that does not fit 64 bits");
    EXPECT_NE(sayOf(json(std::string(1'000'000, '['))).find("is nested more than 64 deep"),
              std::string::npos);
    EXPECT_EQ(sayOf(httpAnswer(200, "application/xml", "<a/>")), stranger + "its answer is application/xml");
    EXPECT_EQ(sayOf(httpAnswer(200, "", kRightAnswer)), stranger + "its answer has no type");
    EXPECT_EQ(sayOf(json(R"({"type": "about:blank"})", 401)),
              stranger + "HTTP status 401, the problem is of no type that is known");
    EXPECT_EQ(sayOf(json(R"({"type": "urn:welcomer:problem:unavailable"})", 401)),
              stranger + "HTTP status 401, urn:welcomer:problem:unavailable comes with the HTTP status 401");
    EXPECT_EQ(sayOf(json(kRightAnswer, 201)), stranger + "HTTP status 201");
    EXPECT_NE(sayOf("\x16\x03\x01 nonsense").find("speaks something else than HTTP"), std::string::npos);
}

TEST_F(AccountServerTest, ALoginPageOfTheNetworkIsToldAsOne) {
    serve(httpAnswer(200, "text/html; charset=utf-8", "<html>Welcome to the hotel</html>"));
    EXPECT_EQ(
        unavailability(ask()),
        name() +
            " shows a web page (its answer is text/html; charset=utf-8): a login page of this network may "
            "stand in between, or the setting AccountServer is wrong");
    serve(httpAnswer(511, "text/plain", "log in"));
    EXPECT_NE(unavailability(ask()).find("a login page of this network may stand in between"),
              std::string::npos);
}

TEST_F(AccountServerTest, ARedirectIsNeverFollowed) {
    for (const int status : {301, 302, 303, 307, 308}) {
        StubServer& stub = serve(httpAnswer(status, "", "", "Location: http://localhost/elsewhere\r\n"));
        EXPECT_NE(
            unavailability(ask()).find("sends on to http://localhost/elsewhere, where no password is sent"),
            std::string::npos);
        EXPECT_EQ(stub.requests().size(), 1U);
    }
}

TEST_F(AccountServerTest, AFrontWithoutAServerBehindItIsToldAsOne) {
    for (const int status : {502, 503, 504}) {
        serve(httpAnswer(status, "text/html", "<html>Bad Gateway</html>"));
        EXPECT_NE(unavailability(ask()).find("reaches no account server behind it"), std::string::npos);
    }
}

TEST_F(AccountServerTest, WhatAServerSendsIsShownAsOnePrintableLine) {
    serve(httpAnswer(200, "x\x1b[2J\xff/y", "", ""));
    for (const char each : unavailability(ask())) {
        EXPECT_TRUE(each >= 0x20 && each <= 0x7E);
    }
}

} // namespace
} // namespace welcomer::desktop
