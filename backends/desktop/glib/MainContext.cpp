#include "backends/desktop/glib/MainContext.h"

namespace welcomer::desktop {

void MainContext::deliver() const {
    while (g_main_context_iteration(_context, FALSE) != FALSE) {
    }
}

void MainContext::waitUntil(const std::function<bool()>& condition) const {
    while (!condition()) {
        g_main_context_iteration(_context, TRUE);
    }
}

bool MainContext::waitUntil(const std::function<bool()>& condition, const Deadline& deadline) const {
    bool isTimeUp = false;
    GSource* const alarm = g_timeout_source_new(static_cast<guint>(wholeMilliseconds(deadline.left())));
    g_source_set_callback(
        alarm,
        [](gpointer flag) -> gboolean {
            *static_cast<bool*>(flag) = true;
            return G_SOURCE_REMOVE;
        },
        &isTimeUp, nullptr);
    g_source_attach(alarm, _context);
    waitUntil([&] { return condition() || isTimeUp; });
    g_source_destroy(alarm);
    g_source_unref(alarm);
    return condition();
}

} // namespace welcomer::desktop
