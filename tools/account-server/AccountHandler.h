// The account server's protocol: what each of its resources answers.

#pragma once

#include "backends/accountserver/Messages.h"
#include "tools/account-server/AccountSource.h"
#include "tools/account-server/AnswerWriter.h"
#include "tools/account-server/FailedTries.h"
#include "tools/account-server/Http.h"
#include "tools/account-server/Metrics.h"
#include "tools/account-server/SeenRequests.h"

#include <functional>
#include <optional>
#include <string>

namespace welcomer::server {

// What is known of the requests so far.
struct RequestHistory {
    FailedTries failedTries;
    SeenRequests seenRequests;
};

class AccountHandler final : public RequestHandler {
  public:
    // Borrows everything.
    //  tellsUnknownUsers  a user that there is not is told from a wrong password
    //  log                takes one line for each request; any thread
    AccountHandler(AccountSource& source, bool tellsUnknownUsers, RequestHistory& history, Metrics& metrics,
                   std::function<void(const std::string&)> log);

    std::optional<Answer> answerAtOnce(const Request& request, std::size_t announcedLength) override;
    Answer answer(Request& request) override;
    Answer overloaded(const Request& request) override;
    Answer tooSlow(const Peer& peer) override;

  private:
    struct Exchange;
    using Question = std::function<SourceAnswer(const std::string& user, const std::string& password)>;

    Answer _authenticate(Exchange& exchange);
    Answer _acceptTerms(Exchange& exchange);
    Answer _refuse(Exchange& exchange, const std::string& why);

    // Asks the source, unless too many tries have failed, and counts how that ends.
    SourceAnswer _check(Exchange& exchange, const std::string& password, const Question& question);

    // Writes the problem where there is one, and the line of the log.
    Answer _finish(Exchange& exchange, Answer answer);

    AccountSource& _source;
    const bool _tellsUnknownUsers;
    RequestHistory& _history;
    Metrics& _metrics;
    const std::function<void(const std::string&)> _log;
};

} // namespace welcomer::server
