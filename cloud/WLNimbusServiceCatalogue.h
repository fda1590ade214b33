// Which cloud services setup may enable, and in which phase: some before the new user's first login, the rest
// after it.

#pragma once

#include <string>
#include <vector>

namespace welcomer {

// The services that are treated alike, in the order in which they are enabled: contacts, calendars,
// bookmarks, photo stream, reminders, account sync. Any thread, as all of these.
std::vector<std::string> WLNimbusSyncServiceIDs();

// Every service that setup may enable: the six above in their order, then Locator, mail, notes, documents and
// data.
std::vector<std::string> WLNimbusAllSetupServiceIDs();

// The services that are enabled after the first login only; every other one is enabled before it only. The
// order says nothing.
std::vector<std::string> WLNimbusPostLoginServiceIDs();

// The services whose enabling after login is put off for some seconds: calendars and reminders.
std::vector<std::string> WLNimbusDelayedServiceIDs();

} // namespace welcomer
