// The delegates that the system treats in a way of their own.

#pragma once

namespace welcomer {

inline constexpr const char* kVidlinkIdentifier = "com.corvid.vidlink"; // video calling
inline constexpr const char* kChatterIdentifier = "com.corvid.chatter"; // messaging

// The former online service: a delegate without a plug-in, whose request is an empty dictionary.
inline constexpr const char* kSkylarkIdentifier = "com.corvid.skylark";

inline constexpr const char* kStorefrontIdentifier = "com.corvid.storefront"; // the app store
inline constexpr const char* kReaderIdentifier = "com.corvid.reader";         // the e-book store

} // namespace welcomer
