// Who is spoken to on a bus with GLib, and how long a report waits.

#pragma once

#include "backends/bus/Peer.h"

#include <chrono>

namespace welcomer::desktop {

using bus::kBusPeer;
using bus::Peer;

// How long a report waits for an answer: what takes longer does not answer.
inline constexpr std::chrono::seconds kReportLimit{5};

} // namespace welcomer::desktop
