// The machine's directory of who can sign in, for a process that may not read it: another one answers.

#pragma once

#include "backends/posix/FileDescriptor.h"
#include "platform/SignInDirectory.h"

#include <mutex>

namespace welcomer::tool {

// Asks over a socket, one question after the other. Where nobody answers any more, or an answer cannot be
// handed on, the directory counts as one that cannot be read. Any thread.
class AskedDirectory final : public platform::SignInDirectory {
  public:
    explicit AskedDirectory(posix::FileDescriptor socket) : _socket(std::move(socket)) {}

    platform::SignInAnswer answer(const std::string& username, const std::string& password,
                                  const PropertyList::Dictionary& delegateRequest) const override;
    platform::SignInAnswer acceptTerms(const std::string& username, const std::string& password,
                                       const PropertyList& terms) const override;
    std::string server() const override;
    PropertyList::Dictionary servicesOfNewAccount(const std::string& username) const override;
    std::optional<std::vector<std::string>> userNames() const override;

  private:
    PropertyList _ask(PropertyList::Dictionary question, const std::string* password = nullptr) const;
    platform::SignInAnswer _askWithPassword(PropertyList::Dictionary question,
                                            const std::string& password) const;

    const posix::FileDescriptor _socket;
    mutable std::mutex _mutex; // one question at a time
};

// Answers what an AskedDirectory at the other end of the socket asks, until that end is closed or asks what
// makes no sense. The one who asks learns no more than these answers. Any thread.
void answerQuestions(int socket, const platform::SignInDirectory& directory);

} // namespace welcomer::tool
