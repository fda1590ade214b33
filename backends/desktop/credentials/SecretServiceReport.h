// What is to be said about the Secret Service in a report.

#pragma once

#include "platform/BackendReport.h"

namespace welcomer::desktop {

// Fills in who serves and why. Starts nobody, and asks the service, never the user; a service that has not
// answered after five seconds is said not to answer. Where the bus itself does not answer, the backend is
// "none": the caller knows whether the local store may serve.
//  result  whether the Secret Service serves, or would once it is started
// Any thread.
bool reportSecretService(platform::BackendReport& report);

} // namespace welcomer::desktop
