// Small looks at the user's environment, and the steps that close setup down.

#pragma once

namespace welcomer {

// Whether the screen lock asks for a password: what was set with the override, or else the user's
// "askForPassword" in the domain "com.corvid.screensaver"; without a value false. Any thread; may read a
// file.
bool WLScreenLockRequiresPassword();

// Has the function above answer this from now on, for the rest of the process, without reading anything. One
// thread at a time, as with all of this header's process-wide flags.
void WLSetScreenLockRequiresPasswordOverride(bool value);

// Whether the full responses of the delegates may be logged. Always true, on purpose; the default
// "WLLogDelegateResponses" and then the folder "/CorvidInternal" are looked at all the same. Any thread.
bool WLShouldLogDelegateResponses();

// Tells the account service that setup has finished. Any thread.
void WLCallTesselFinishedSetup();

// Runs "/usr/libexec/transition" and waits for its end.
//  result  whether it could be run and waited for; what it did is not asked. Each outcome has its log line.
// Throws what the launcher throws that is no std::exception. Any thread.
bool WLRunTransitionTool();

// Whether the hardware-warranty marker file exists. Once it has been seen, the answer stays true for the rest
// of the process; until then every call looks.
bool WLShouldShowHardwareWarranty();

// Removes the marker file, whatever comes of it. The answer of the function above is not changed by that.
void WLRemoveHardwareWarrantyMarker();

} // namespace welcomer
