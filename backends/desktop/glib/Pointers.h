// Owners of what GLib hands out. For modules only, as all of this folder.

#pragma once

#include <gio/gio.h>
#include <memory>

namespace welcomer::desktop {

template <auto release>
struct GLibDelete {
    template <class Object>
    void operator()(Object* object) const {
        release(object);
    }
};

// Owns one reference.
template <class Object>
using ObjectPointer = std::unique_ptr<Object, GLibDelete<g_object_unref>>;
using VariantPointer = std::unique_ptr<GVariant, GLibDelete<g_variant_unref>>;
using TextPointer = std::unique_ptr<char, GLibDelete<g_free>>;

// Takes a GError: pass out() where one is expected.
class ErrorSlot {
  public:
    ErrorSlot() = default;
    ~ErrorSlot() { g_clear_error(&_error); }
    ErrorSlot(const ErrorSlot&) = delete;
    ErrorSlot& operator=(const ErrorSlot&) = delete;

    GError** out() {
        g_clear_error(&_error);
        return &_error;
    }
    const GError* get() const { return _error; }
    explicit operator bool() const { return _error != nullptr; }

  private:
    GError* _error = nullptr;
};

} // namespace welcomer::desktop
