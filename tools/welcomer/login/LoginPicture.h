// The timeline of a login as a picture.

#pragma once

#include "tools/welcomer/login/LoginRecord.h"

#include <chrono>
#include <optional>
#include <string>

namespace welcomer::tool {

// What the picture says besides what the record has.
struct PictureTexts {
    std::string title;
    std::string when; // in the line below; may be empty
};

// The timeline: what the agent itself did, a mark for each service, and a bar for each delegate, those of one
// queue together. An outcome shows in its colour, in its mark and in how its bar is filled.
//  runningFor  since its beginning, of an agent that still runs
//  result      an SVG document for a light and for a dark theme
// Any thread.
std::string drawLogin(const LoginRecord& record, const PictureTexts& texts,
                      std::optional<std::chrono::nanoseconds> runningFor = std::nullopt);

// Puts a picture in the place of a file of this machine, in one step. Throws CommandFailure.
void writePicture(const std::string& path, const std::string& picture);

} // namespace welcomer::tool
