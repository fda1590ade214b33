// The delegates that the system treats in a way of their own.

#pragma once

namespace welcomer {

inline constexpr char kVidlinkIdentifier[] = "com.corvid.vidlink"; // video calling
inline constexpr char kChatterIdentifier[] = "com.corvid.chatter"; // messaging

// The former online service: a delegate without a plug-in, whose request is an empty dictionary.
inline constexpr char kSkylarkIdentifier[] = "com.corvid.skylark";

inline constexpr char kStorefrontIdentifier[] = "com.corvid.storefront"; // the app store
inline constexpr char kReaderIdentifier[] = "com.corvid.reader";         // the e-book store

} // namespace welcomer
