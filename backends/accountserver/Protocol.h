// What both ends of the account server's protocol agree on beside the messages: docs/account-server.md in
// numbers and texts.

#pragma once

#include <cstddef>
#include <optional>
#include <string_view>

namespace welcomer::accountserver {

// The resources. The version of the protocol is in the path.
inline constexpr char kAuthenticatePath[] = "/v1/authenticate";
inline constexpr char kAcceptTermsPath[] = "/v1/accept-terms";
inline constexpr char kServerPath[] = "/v1/server";

// Where the server of a machine is asked by the users of that machine.
inline constexpr char kSocketPath[] = "/run/welcomer-account-server.sock";

// How the content of a body is written.
enum class ContentType { JSON, PropertyList };

inline constexpr char kJSONContentType[] = "application/json";
inline constexpr char kPropertyListContentType[] = "application/x-plist";
inline constexpr char kProblemContentType[] = "application/problem+json";

// What the header field Content-Type says, whatever its case and parameters; none for another type. A problem
// in JSON counts as JSON. Any thread.
std::optional<ContentType> contentTypeNamed(std::string_view field);

// Longer bodies are refused in both directions.
inline constexpr std::size_t kMaximumBodySize = std::size_t{16} * 1024 * 1024; // bytes

// How deep objects and arrays in JSON may be nested, and how many values there may be in all of a body. A
// property list may be as deep as kPropertyListMaximumDepth says.
inline constexpr int kMaximumJSONDepth = 64;
inline constexpr std::size_t kMaximumJSONValues = std::size_t{1} << 18U;

inline constexpr std::size_t kMaximumRequestIDSize = 64;  // bytes, of ASCII letters, digits and hyphens
inline constexpr std::size_t kMaximumUserSize = 1024;     // bytes
inline constexpr std::size_t kMaximumPasswordSize = 4096; // bytes

} // namespace welcomer::accountserver
