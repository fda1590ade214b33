#include "tools/welcomer/login/LoginPicture.h"

#include "tools/welcomer/login/SVGDrawing.h"
#include "tools/welcomer/login/TimeScale.h"
#include "tools/welcomer/terminal/Failure.h"

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <sstream>

namespace welcomer::tool {
namespace {

using namespace std::chrono_literals;

LoginRecord recordOf(std::initializer_list<std::pair<std::chrono::nanoseconds, const char*>> lines) {
    LoginRecord record;
    for (const auto& [time, line] : lines) {
        record.read(time, line);
    }
    return record;
}

std::size_t count(const std::string& text, const std::string& wanted) {
    std::size_t found = 0;
    for (std::size_t at = text.find(wanted); at != std::string::npos; at = text.find(wanted, at + 1)) {
        ++found;
    }
    return found;
}

// What of the drawing has one class.
std::size_t drawn(const std::string& picture, const std::string& className) {
    return count(picture, "class=\"" + className + "\"");
}

TEST(LoginPicture, EveryOutcomeHasAColourAndAMarkOfItsOwn) {
    const std::string picture =
        drawLogin(recordOf({{0s, "Self destructing..."},
                            {10ms, "no cached response for a.unasked"},
                            {20ms, "setting up a.completes"},
                            {20ms, "setting up a.refuses"},
                            {20ms, "setting up a.raises"},
                            {20ms, "setting up a.silent"},
                            {1s, "a.completes setup: completed (1.000 seconds)"},
                            {2s, "a.refuses setup: no room (2.000 seconds)"},
                            {3s, "exception in setup response for plugin a.raises (3.000 seconds): broke"}}),
                  {"Login", ""});
    // One in the picture and one in the legend; of a bar besides those.
    for (const char* className : {"completed mark", "refused mark", "never mark", "none mark", "completed",
                                  "refused", "raised", "never", "stripes", "grid"}) {
        EXPECT_EQ(drawn(picture, className), 2U) << className;
    }
    EXPECT_EQ(drawn(picture, "raised mark"), 3U); // and where the agent's own line breaks off
    EXPECT_EQ(drawn(picture, "none"), 0U);        // who was not asked has no bar
    for (const char* text : {"a.unasked: no cached response", "a.completes: completed", "a.refuses: no room",
                             "a.raises: exception: broke", "a.silent: never answered"}) {
        EXPECT_EQ(count(picture, text), 1U) << text;
    }
}

TEST(LoginPicture, AnAgentThatRunsHasDelegatesThatHaveNotAnsweredYet) {
    const LoginRecord record = recordOf({{0s, "Self destructing..."}, {1s, "setting up a.silent"}});
    const std::string picture = drawLogin(record, {"Login", ""}, 300s);
    EXPECT_EQ(count(picture, "a.silent: has not answered yet"), 1U);
    EXPECT_EQ(count(picture, "the agent runs, for 300 s so far"), 2U); // for the ear and for the eye
    EXPECT_EQ(drawn(picture, "raised mark"), 1U);                      // in the legend
}

TEST(LoginPicture, AnAgentThatEndedHasItsEnd) {
    const std::string picture = drawLogin(
        recordOf({{0s, "Self destructing..."}, {1s, "delaying exit by two minutes"}, {121s, "exiting"}}),
        {"Login", "today"});
    EXPECT_EQ(drawn(picture, "end"), 1U);
    EXPECT_EQ(count(picture, "today, the agent ended after 121.0 s"), 1U);
    EXPECT_EQ(drawn(picture, "lingers"), 1U);
}

TEST(LoginPicture, ServicesAreMarksAndThoseOfSetupAreNone) {
    const std::string picture = drawLogin(
        recordOf({{0s, "Enabling Nimbus service 'x.contacts'"},
                  {0s, "Enabling 'x.calendars' after a 3.00 second delay"},
                  {0s, "x.locator should be configured pre-login"},
                  {0s, "Enabling 'x.reminders' after a 3.00 second delay"},
                  {0s, "Nimbus service 'x.bookmarks' cannot be enabled on this machine for this user."},
                  {3s, "Enabling Nimbus service 'x.calendars'"},
                  {4s, "exiting"}}),
        {"Login", ""});
    EXPECT_EQ(drawn(picture, "service mark"), 3U); // with the one in the legend
    EXPECT_EQ(drawn(picture, "completed mark"), 1U);
    EXPECT_EQ(drawn(picture, "putoff"), 2U);
    EXPECT_EQ(drawn(picture, "never putoff"), 1U);
    EXPECT_EQ(drawn(picture, "refused mark"), 2U);
    EXPECT_EQ(count(picture, "locator"), 0U);
    EXPECT_EQ(count(picture, ">cannot be enabled on this machine for this user.</text>"), 1U);
    EXPECT_EQ(count(picture, ">put off, and not enabled</text>"), 1U);
}

TEST(LoginPicture, TheTwoOfOneQueueStandTogether) {
    const std::string picture = drawLogin(recordOf({{0s, "setting up com.corvid.chatter"},
                                                    {0s, "setting up com.corvid.other"},
                                                    {0s, "setting up com.corvid.vidlink"}}),
                                          {"Login", ""});
    EXPECT_EQ(drawn(picture, "queue"), 2U); // with the one in the legend
    EXPECT_LT(picture.find("vidlink: "), picture.find("other: "));
    EXPECT_EQ(drawn(drawLogin(recordOf({{0s, "setting up com.corvid.chatter"}}), {"Login", ""}), "queue"),
              1U);
}

TEST(LoginPicture, TextsFromElsewhereAreEscaped) {
    const std::string picture = drawLogin(
        recordOf({{0s, "setting up a<b>&\"c"}, {1s, "ended by plug-in x</style>: \x01\xFF"}}), {"<&>", ""});
    EXPECT_EQ(count(picture, "a<b>"), 0U);
    EXPECT_EQ(count(picture, "a&lt;b&gt;&amp;&quot;c"), 2U);
    EXPECT_EQ(count(picture, "</style>"), 1U);
    EXPECT_EQ(count(picture, "\xFF") + count(picture, "\x01"), 0U);
    EXPECT_EQ(xmlText("a\xFF\x02\n\xC3\xA9"), "a\xEF\xBF\xBD\\x02\\n\xC3\xA9");
}

TEST(LoginPicture, TheDarkThemeHasItsOwnColours) {
    const std::string picture = drawLogin({}, {"Login", ""});
    EXPECT_EQ(count(picture, "@media (prefers-color-scheme: dark)"), 1U);
}

TEST(LoginPicture, AFileIsReplacedAndWhatCannotBeWrittenIsSaid) {
    const std::filesystem::path path = std::filesystem::path(testing::TempDir()) / "picture-test.svg";
    std::ofstream(path) << "old";
    writePicture(path.string(), "new");
    std::ostringstream content;
    content << std::ifstream(path).rdbuf();
    EXPECT_EQ(content.str(), "new");
    std::filesystem::remove(path);
    EXPECT_THROW(writePicture("/nowhere/at/all.svg", ""), CommandFailure);
}

TEST(TimeScale, WhatIsFarBehindStandsBehindABreak) {
    const TimeScale scale(100, 1100, 12s, 120s);
    EXPECT_TRUE(scale.isBroken());
    EXPECT_EQ(scale.at(0s), 100);
    EXPECT_NEAR(scale.at(13s), scale.breakAt(), 0.1);
    EXPECT_EQ(scale.at(120s), 1100);
    EXPECT_EQ(scale.at(1h), 1100);
    EXPECT_LT(scale.at(12s), scale.breakAt());
    EXPECT_EQ(scale.ticks().front(), 0s);
    EXPECT_EQ(scale.ticks()[1], 2s);
}

TEST(TimeScale, WhatIsNearNeedsNone) {
    const TimeScale scale(0, 100, 12s, 20s);
    EXPECT_FALSE(scale.isBroken());
    EXPECT_EQ(scale.at(20s), 100);
    EXPECT_EQ(scale.at(10s), 50);
}

TEST(TimeScale, NoTimeAtAllIsShown) {
    const TimeScale scale(0, 100, 0s, 0s);
    EXPECT_EQ(scale.at(0s), 0);
    EXPECT_FALSE(scale.ticks().empty());
}

} // namespace
} // namespace welcomer::tool
