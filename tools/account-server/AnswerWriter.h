// The protocol's answers in the form that a client takes.

#pragma once

#include "backends/accountserver/Messages.h"
#include "tools/account-server/Http.h"

#include <string>
#include <string_view>

namespace welcomer::server {

// Which forms a client takes, by its header field Accept; an empty one takes everything. What has a quality of 0
// is not taken; beyond that qualities count for nothing.
struct AcceptedForms {
    bool json = false;
    bool propertyList = false;
    bool problem = false; // in JSON

    explicit AcceptedForms(std::string_view field);
    bool isEmpty() const { return !json && !propertyList; }
};

// Each writes an answer. The first form is that of the request; the other one serves where that is not accepted,
// or has no place for what is in the answer. Where neither does, the answer is that problem.
// Any thread.
Answer writeAnswer(const accountserver::AuthenticateAnswer& answer, const std::string& requestID,
                   const AcceptedForms& accepted, accountserver::ContentType first);
Answer writeAnswer(const accountserver::ServerDescription& description, const AcceptedForms& accepted);
Answer writeProblem(const accountserver::Problem& problem, const AcceptedForms& accepted);

} // namespace welcomer::server
