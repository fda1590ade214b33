// Owners of what GLib's functions hand out.

#pragma once

#include <gio/gio.h>

#include <memory>

namespace welcomer::desktop {

struct GLibRelease {
    void operator()(GVariant* value) const { g_variant_unref(value); }
    void operator()(GError* error) const { g_error_free(error); }
    void operator()(GMainContext* context) const { g_main_context_unref(context); }
    void operator()(gchar* text) const { g_free(text); }
};
struct ObjectRelease {
    void operator()(gpointer object) const { g_object_unref(object); }
};

using VariantPointer = std::unique_ptr<GVariant, GLibRelease>;
using ErrorPointer = std::unique_ptr<GError, GLibRelease>;
using ContextPointer = std::unique_ptr<GMainContext, GLibRelease>;
using TextPointer = std::unique_ptr<gchar, GLibRelease>;
template <class T>
using ObjectPointer = std::unique_ptr<T, ObjectRelease>;

} // namespace welcomer::desktop
