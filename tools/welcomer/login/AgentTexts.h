// The agent's log lines as far as they are recognised: the one place that repeats their texts.

#pragma once

#include "agent/wlnimbussetup.h"
#include "handoff/ReplayItem.h"

#include <optional>
#include <string_view>

namespace welcomer::tool::agenttext {

// Lines that stand as they are.
inline constexpr std::string_view kBegin = "Self destructing...";
inline constexpr std::string_view kNoAccountName = "Failed to get account name attribute";
inline constexpr std::string_view kNoAccount = "Failed to retrieve SK_Account";
inline constexpr std::string_view kLinger = "delaying exit by two minutes";
inline constexpr std::string_view kEnd = kAgentExitingMessage;

// What lines begin with; something follows.
inline constexpr std::string_view kFileStays = "Failed to remove wlnimbussetup plist for ";
inline constexpr std::string_view kItemNotFound =
    std::string_view(kReplayItemNotFoundMessage)
        .substr(0, std::string_view(kReplayItemNotFoundMessage).size() - 2);
inline constexpr std::string_view kItemUnreadable = "Failed to deserialize replayable data length: ";
inline constexpr std::string_view kItemStays = "Failed to delete replay keychain item: ";
inline constexpr std::string_view kAccountName = "Enabling post-login services for account ";
inline constexpr std::string_view kNotKilled = "Exception killing onlineaccounts: ";
inline constexpr std::string_view kStepRaised = "exception in wlnimbussetup: ";
inline constexpr std::string_view kEndedByPlugin = "ended by plug-in ";
inline constexpr std::string_view kEndedOutside = "ended outside of any call into a plug-in: ";

// Of plug-ins that take no part.
inline constexpr std::string_view kPluginRefused = "Nimbus Plugins: ";
inline constexpr std::string_view kPluginWithoutIdentifier = "exception querying plugin ";

// Of delegates: an identifier follows, or stands before.
inline constexpr std::string_view kDelegateBegins = "setting up ";
inline constexpr std::string_view kNoResponse = "no cached response for ";
inline constexpr std::string_view kDelegateRaised = "exception in setup response for plugin ";
inline constexpr std::string_view kAnsweredWithAliases = " setup+chosen: ";
inline constexpr std::string_view kAnswered = " setup: ";
inline constexpr std::string_view kProgress = " progress: ";
inline constexpr std::string_view kCompleted = "completed";
inline constexpr std::string_view kSecondsBegin = " (";
inline constexpr std::string_view kSecondsEnd = " seconds)";

// Of services, with the identifier or a name of their own between.
inline constexpr std::string_view kServiceOn = "Enabling Nimbus service '";
inline constexpr std::string_view kServiceOnEnd = "'";
inline constexpr std::string_view kServicePutOff = "Enabling '";
inline constexpr std::string_view kServicePutOffMiddle = "' after a ";
inline constexpr std::string_view kServicePutOffEnd = " second delay";
inline constexpr std::string_view kServiceRefused = "Nimbus service '";
inline constexpr std::string_view kServiceRefusedEnd = "' cannot be enabled on this machine for this user.";
inline constexpr std::string_view kOfOtherPhaseEnd = " should be configured pre-login";
inline constexpr std::string_view kNamedOn = "Enabling Nimbus ";
inline constexpr std::string_view kNamedRefused = "Nimbus ";
inline constexpr std::string_view kNamedRefusedEnd = " cannot be enabled on this machine for this user.";
inline constexpr std::string_view kNamedMissing = "No Nimbus ";
inline constexpr std::string_view kNamedMissingEnd = " service available to enable";
inline constexpr std::string_view kMailWithoutAddress =
    "Could not enable Nimbus Mail, no address specified by SKService";
inline constexpr std::string_view kNotesWithoutAddress =
    "Cannot enable Nimbus notes without associated email address";

// What its launcher says after the agent's end.
inline constexpr std::string_view kOffered = "Launch agent ";
inline constexpr std::string_view kNotOffered = "Failed to offer launch agent ";

// What follows a beginning; none where the line begins in another way.
constexpr std::optional<std::string_view> after(std::string_view line, std::string_view beginning) {
    return line.starts_with(beginning) ? std::optional(line.substr(beginning.size())) : std::nullopt;
}

// What stands between a beginning and an end; none where the line has not both.
constexpr std::optional<std::string_view> between(std::string_view line, std::string_view beginning,
                                                  std::string_view end) {
    const auto rest = after(line, beginning);
    return rest && rest->ends_with(end) ? std::optional(rest->substr(0, rest->size() - end.size()))
                                        : std::nullopt;
}

} // namespace welcomer::tool::agenttext
