// Having the agent of this system run at the next login again, where it could not do its work at this one.

#pragma once

#include "tools/launch-agents/startLaunchAgents.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::launch {

// How often an agent that was set up once is offered again.
inline constexpr int kMostOffers = 3;

// What its definition says of that: how often it was, in a file that was put back.
inline constexpr char kOffersKey[] = "OfferedAgain";

// Whether the agent could not ask for its replay item: the keyring was locked or did not answer, or there was
// none to be asked. Then it has read nothing, and its last two lines say so.
//  lines   all that one run of the agent has logged, in order
//  result  the credential store's status; none where it could ask, or where that is not certain
// Any thread.
std::optional<std::int32_t> statusOfUnaskedItem(const std::vector<std::string>& lines);

// Puts an agent's file back, unless that was done as often as may be; one line in the log says which. A file
// that is there already, as of a new setup, stays as it is.
//  folder  the user's launch agents
//  agent   as it was read before it was started
//  status  why it could not do its work
// Any thread.
void putBack(const std::string& folder, const LaunchAgent& agent, std::int32_t status);

// Waits for the end of the agent of this system, where it was started and its lines can be found, and puts
// its file back where it could not ask for its item. What it has logged in that very run is what counts: an
// agent that may have read its item is never offered again.
// Main thread; blocks for as long as the agent runs, and ten seconds more where its lines are not found.
void offerAgain(const std::string& folder, StartedAgents started);

} // namespace welcomer::launch
