// What the host offers plug-ins beyond its first table of functions; see the SDK's extensions/.

#pragma once

#include "sdk/welcomer/extensions/context.h"
#include "sdk/welcomer/extensions/dispatch.h"
#include "sdk/welcomer/extensions/log.h"
#include "sdk/welcomer/extensions/progress.h"

namespace welcomer {

// The extension of an identifier, or null. Lives until the process ends, as each of them does. Any thread.
const void* hostExtension(const char* identifier) noexcept;

const wl_log& logExtension();
const wl_context& contextExtension();
const wl_progress& progressExtension();
const wl_dispatch& dispatchExtension();

// Makes the calling thread's run loop the main loop that plug-ins have their blocks run on. Any thread.
void setPluginMainLoop();

// Drops the blocks of an instance that have not run. Any thread.
void dropBlocksOf(const wl_delegate* instance);

} // namespace welcomer
