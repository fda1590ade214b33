// A delegate plug-in as the system sees it. Plug-in authors work with the headers in sdk/ instead.

#pragma once

#include "platform/Error.h"
#include "propertylist/PropertyList.h"

#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

// Every operation may throw anything at all: a plug-in that raises.
class WLFirstRunDelegateConfiguration {
  public:
    // Takes the outcome: the success flag, and the error object, which a plug-in may leave out.
    using CompletionHandler =
        std::function<void(bool succeeded, const std::optional<platform::Error>& error)>;

    virtual ~WLFirstRunDelegateConfiguration() = default;

    // The delegate's identifier, or none.
    virtual std::optional<std::string> delegateIdentifier() = 0;

    // This delegate's part of the account setup request; none means that it leaves itself out of setup.
    virtual std::optional<PropertyList> delegateSetupRequest() = 0;

    // Finishes the delegate's setup from the server's response, which is handed over as it stands, whatever
    // its type. The handler is to be called exactly once, on any thread.
    virtual void completeSetupWithResponseHandler(const PropertyList& response,
                                                  CompletionHandler handler) = 0;

    // Stops a running completion.
    virtual void terminateSetupCompletion() {}

    // The two operations below are outside the protocol: only the video-calling and the messaging delegate
    // have them.

    // As above, with the aliases that the user chose; none when there are none.
    virtual void
    completeSetupWithResponseChosenAliasesHandler(const PropertyList& response,
                                                  const std::optional<std::vector<std::string>>& aliases,
                                                  CompletionHandler handler) = 0;

    // The aliases that the server offers this delegate.
    virtual std::optional<std::vector<std::string>>
    messagingAliasesFromResponse(const PropertyList& response) = 0;

    // The name of the class, which stands for the plug-in in messages.
    virtual std::string className() const = 0;
};

// How a plug-in looks in a message: an object as <ClassName>.
inline std::string describe(const WLFirstRunDelegateConfiguration& plugin) {
    return "<" + plugin.className() + ">";
}

} // namespace welcomer
