// The delegates that the system treats in a way of their own.

#pragma once

namespace welcomer {

inline constexpr const char* kVidlinkIdentifier = "com.corvid.vidlink"; // video calling
inline constexpr const char* kChatterIdentifier = "com.corvid.chatter"; // messaging

} // namespace welcomer
