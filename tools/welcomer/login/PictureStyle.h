// How a login's picture looks: colours, marks and patterns.

#pragma once

#include "tools/welcomer/login/DelegateReport.h"

#include <array>
#include <string_view>
#include <utility>

namespace welcomer::tool {

// Marks around a point, about 14 pixels wide: each says by itself what its colour says.
inline constexpr std::string_view kCheck =
    "M-7 0a7 7 0 1 0 14 0a7 7 0 1 0 -14 0zM-3.6 0.2l1.4 -1.4l1.6 1.6l3.8 -3.8l1.4 "
    "1.4l-5.2 5.2z";
inline constexpr std::string_view kBang = "M0 -7.5L8 6.5H-8zM-0.9 -3.2h1.8l-0.3 5h-1.2zM-0.9 3h1.8v1.8h-1.8z";
inline constexpr std::string_view kCross =
    "M-7 -7H7V7H-7zM-4 -2.6l1.4 -1.4l2.6 2.6l2.6 -2.6l1.4 1.4l-2.6 2.6l2.6 "
    "2.6l-1.4 1.4l-2.6 -2.6l-2.6 2.6l-1.4 -1.4l2.6 -2.6z";
inline constexpr std::string_view kDots = "M-7 -2h4v4h-4zM-1 -2h4v4h-4zM5 -2h4v4h-4z";
inline constexpr std::string_view kRing =
    "M-6 0a6 6 0 1 0 12 0a6 6 0 1 0 -12 0zM-4 0a4 4 0 1 0 8 0a4 4 0 1 0 -8 0z";
inline constexpr std::string_view kDiamond = "M0 -6L6 0L0 6L-6 0z";

// How one outcome is drawn.
struct OutcomeLook {
    const char* className;
    const char* pattern; // over the bar, or null
    std::string_view mark;
};

constexpr OutcomeLook lookOf(DelegateOutcome::Kind kind) {
    switch (kind) {
    case DelegateOutcome::Kind::Completed:
        return {"completed", nullptr, kCheck};
    case DelegateOutcome::Kind::Refused:
        return {"refused", "stripes", kBang};
    case DelegateOutcome::Kind::Raised:
        return {"raised", "grid", kCross};
    case DelegateOutcome::Kind::NoResponse:
        return {"none", nullptr, kRing};
    case DelegateOutcome::Kind::Working:
        break;
    }
    return {"never", nullptr, kDots};
}

inline constexpr std::array<std::pair<DelegateOutcome::Kind, const char*>, 5> kLegend{
    {{DelegateOutcome::Kind::Completed, "completed"},
     {DelegateOutcome::Kind::Refused, "refused"},
     {DelegateOutcome::Kind::Raised, "exception"},
     {DelegateOutcome::Kind::Working, "never answered"},
     {DelegateOutcome::Kind::NoResponse, "nothing for it to do"}}};

// Plain rules, so that a viewer without themes shows the light one.
inline constexpr std::string_view kPictureStyle = R"(
svg { font-family: system-ui, "DejaVu Sans", sans-serif; font-size: 13px; }
.page { fill: #ffffff; }
text { fill: #1f2328; }
.title { font-size: 18px; font-weight: 600; }
.quiet, .time { fill: #57606a; }
.time { font-size: 11px; text-anchor: middle; }
.name { text-anchor: end; font-weight: 600; }
.small { font-size: 11px; font-weight: 400; }
.inside, .beside { font-size: 11px; }
.beside { stroke: #ffffff; stroke-width: 4; stroke-linejoin: round; paint-order: stroke; }
.before { text-anchor: end; }
.begins { fill: #b9c2cc; }
.waits { fill: #9cc3ea; }
.lingers { fill: #dde7f1; }
.end { stroke: #1f2328; stroke-width: 3; }
.completed, .service { fill: #1a7f4b; }
.refused { fill: #c77700; }
.raised { fill: #c62f2f; }
.never { fill: #e9ddf7; stroke: #7a4fb5; stroke-width: 1.5; stroke-dasharray: 5 3; }
.never.mark { fill: #7a4fb5; stroke: none; }
.none { fill: #76808a; }
.mark { fill-rule: evenodd; }
.stripes { fill: url(#stripes); }
.grid { fill: url(#grid); }
.over { stroke: #ffffff; stroke-width: 2.5; }
.putoff { stroke: #1a7f4b; stroke-width: 1.5; stroke-dasharray: 2 3; }
.never.putoff { stroke: #7a4fb5; }
.queue { fill: none; stroke: #57606a; stroke-width: 1.5; }
.axis { fill: none; stroke: #57606a; stroke-width: 1; }
.tick { stroke: #d0d7de; stroke-width: 1; }
@media (prefers-color-scheme: dark) {
.page { fill: #14181d; }
text { fill: #e6edf3; }
.quiet, .time { fill: #9aa5b1; }
.beside { stroke: #14181d; }
.begins { fill: #4b5661; }
.waits { fill: #2f5f92; }
.lingers { fill: #243447; }
.end { stroke: #e6edf3; }
.completed, .service { fill: #3fb57a; }
.refused { fill: #e5a13a; }
.raised { fill: #f0645f; }
.never { fill: #33264a; stroke: #b692ea; }
.never.mark { fill: #b692ea; }
.none { fill: #9aa5b1; }
.over { stroke: #14181d; }
.putoff { stroke: #3fb57a; }
.never.putoff { stroke: #b692ea; }
.queue, .axis { stroke: #9aa5b1; }
.tick { stroke: #2b333c; }
}
)";

inline constexpr std::string_view kPictureShared = R"SVG(
<pattern id="stripes" width="8" height="8" patternUnits="userSpaceOnUse" patternTransform="rotate(45)">
<line class="over" x1="0" y1="0" x2="0" y2="8"/></pattern>
<pattern id="grid" width="7" height="7" patternUnits="userSpaceOnUse" patternTransform="rotate(45)">
<path class="over" d="M0 0V7M0 0H7"/></pattern>
)SVG";

} // namespace welcomer::tool
