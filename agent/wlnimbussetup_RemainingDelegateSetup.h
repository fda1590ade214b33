// The agent's second setup stage: every delegate plug-in finishes its own setup.

#pragma once

#include "platform/DispatchQueue.h"
#include "propertylist/PropertyList.h"

#include <memory>
#include <optional>
#include <string>

namespace welcomer {

// Hands every plug-in that has a cached response in the replay object that response, on queues of their own;
// the video-calling and the messaging delegate share one. Each outcome is logged with the seconds that it
// took.
//  replayObject  what the setup application left (handoff/ReplayItem.h); an entry of the wrong type counts as
//                absent. Only read during the call.
//  text          never read
//  group         entered once for each plug-in before this returns, and left once when the plug-in calls its
//                handler or its call raises, whichever comes first
// Main thread; returns after queueing.
void wlnimbussetup_RemainingDelegateSetup(const PropertyList& replayObject,
                                          const std::optional<std::string>& text,
                                          const std::shared_ptr<platform::WorkGroup>& group);

} // namespace welcomer
