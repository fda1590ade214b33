// How the tests of the account server's client ask a server of their own.

#pragma once

#include "backends/accountserver/Messages.h"
#include "backends/desktop/accountserver/AccountServerClient.h"
#include "platform/AccountService.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/support/StubServer.h"

#include <gtest/gtest.h>

#include <chrono>
#include <memory>
#include <string>

namespace welcomer::desktop {

class AccountServerTest : public testing::Test {
  protected:
    // Has every request answered with these bytes.
    StubServer& serve(const std::string& answer) {
        return serve([answer](const StubRequest&) { return answer; });
    }
    StubServer& serve(StubServer::Answer answer) {
        server.reset();
        server = std::make_unique<StubServer>(root.locate("/socket"), std::move(answer));
        return *server;
    }

    AccountServerClient client(std::chrono::seconds limit = std::chrono::seconds(30)) const {
        return AccountServerClient({[this, limit] {
                                        return AccountServerSettings{"unix:" + root.locate("/socket"), "", "",
                                                                     std::chrono::seconds(10), limit};
                                    },
                                    [] {
                                        return accountserver::Machine{"Debian GNU/Linux", "12", "C.UTF-8"};
                                    }});
    }

    platform::SignInAnswer ask() const { return client().answer("anna", "secret", {}); }

    // The text for people of an answer that means that the server cannot be asked.
    static std::string unavailability(const platform::SignInAnswer& answer) {
        EXPECT_FALSE(answer.isCompleted);
        EXPECT_EQ(answer.contents.at(platform::kSKPropertyAccountError),
                  PropertyList(platform::kSKAccountErrorServerUnavailable));
        const auto info = answer.contents.find(platform::kSKPropertyAccountErrorInfo);
        const std::string* const text = info == answer.contents.end() ? nullptr : info->second.string();
        EXPECT_TRUE(text && !text->empty() && text->find('\n') == std::string::npos);
        return text ? *text : "";
    }

    static std::string json(const std::string& body, int status = 200) {
        return httpAnswer(status, "application/json", body);
    }

    std::string name() const { return "the socket " + root.locate("/socket"); }

    const TemporaryRoot root;
    std::unique_ptr<StubServer> server;
};

inline constexpr char kRightAnswer[] =
    R"({"status": 0, "accountID": "anna", "delegates": {"com.corvid.chatter": {"status": 0}},)"
    R"( "mailAddress": "anna@example.org",)"
    R"( "services": {"com.corvid.nimbus.service.mail": {"canBeEnabled": false}}})";

} // namespace welcomer::desktop
