// Recording which setup screens the user has seen.

#pragma once

namespace welcomer {

// Each marks the setup as seen on the shared record, at the running system's product version. Nothing is
// stored until somebody calls the record's `writeToDefaults`. Any thread.
void WLRecordCloudSetupSeen();
void WLRecordSyncSetupSeen();

} // namespace welcomer
