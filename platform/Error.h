// What a platform operation says when it fails.

#pragma once

#include <stdexcept>
#include <string>
#include <utility>

namespace welcomer::platform {

// An error object: the system's error number and a text for people.
struct Error {
    int number = 0;      // errno's value where the system gave one, else 0
    std::string message; // one line

    friend bool operator==(const Error&, const Error&) = default;
};

// How an error looks in a message.
inline std::string describe(const Error& error) {
    return error.message;
}

// The outcome of an operation that has no result of its own. The error is meaningful only on failure.
struct [[nodiscard]] Outcome {
    bool failed = false;
    Error error;

    static Outcome success() { return {}; }
    static Outcome failure(Error error) { return {true, std::move(error)}; }

    explicit operator bool() const { return !failed; }
};

// What a platform operation throws where its rules speak of raising. "Errors of the platform's object-error
// kind" are std::exceptions, this one among them.
class Exception : public std::runtime_error {
  public:
    using std::runtime_error::runtime_error;
};

} // namespace welcomer::platform
