// What comes over the network on either end: answers, problems and requests, in both forms.

#include "backends/accountserver/Messages.h"
#include "tests/fuzz/Require.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

using namespace welcomer;
using namespace welcomer::accountserver;

namespace {

template <class Message>
void requireWellFormed(const Decoded<Message>& decoded) {
    require(decoded.message.has_value() == decoded.error.empty(), "either a message or an error");
    for (const char character : decoded.error) {
        require(character >= 0x20 && character <= 0x7E, "an error is one printable line");
    }
}

std::optional<std::string> encodeAgain(const auto& message, ContentType type) {
    return encode(message, type);
}

template <class Request>
std::optional<std::string> encodeAgain(const WithPassword<Request>& message, ContentType type) {
    return encode(message.request, message.password, type);
}

// What was read in a form is written in it, where it fits, and is then read and written as the same.
template <class Decode>
void requireRoundTrip(std::string_view text, ContentType type, const Decode& decode) {
    const auto decoded = decode(text);
    requireWellFormed(decoded);
    if (!decoded) {
        return;
    }
    if (const auto body = encodeAgain(*decoded.message, type)) {
        const auto again = decode(*body);
        require(again && encodeAgain(*again.message, type) == body, "a message stays what it is");
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    const std::string_view text(reinterpret_cast<const char*>(bytes), size);
    for (const ContentType type : {ContentType::JSON, ContentType::PropertyList}) {
        requireRoundTrip(text, type, [type](auto body) { return decodeAuthenticateAnswer(body, type); });
        requireRoundTrip(text, type, [type](auto body) { return decodeProblem(body, type, 403); });
        requireRoundTrip(text, type, [type](auto body) { return decodeServerDescription(body, type); });
        requireRoundTrip(text, type, [type](auto body) { return decodeAuthenticateRequest(body, type); });
        requireRoundTrip(text, type, [type](auto body) { return decodeAcceptTermsRequest(body, type); });
    }
    return 0;
}
