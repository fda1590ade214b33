// A main context of one's own, and waiting on it.

#pragma once

#include "backends/desktop/glib/Deadline.h"

#include <functional>
#include <gio/gio.h>

namespace welcomer::desktop {

// What libraries deliver to whoever made their objects arrives here, and only while one of these functions
// runs: nothing of it runs on a main context of the process. One thread at a time.
class MainContext {
  public:
    // Makes the context this thread's own, for as long as this lives: objects that are made meanwhile deliver
    // to it.
    class Scope {
      public:
        explicit Scope(MainContext& context) : _context(context._context) {
            g_main_context_push_thread_default(_context);
        }
        ~Scope() { g_main_context_pop_thread_default(_context); }
        Scope(const Scope&) = delete;
        Scope& operator=(const Scope&) = delete;

      private:
        GMainContext* const _context;
    };

    MainContext() = default;
    ~MainContext() { g_main_context_unref(_context); }
    MainContext(const MainContext&) = delete;
    MainContext& operator=(const MainContext&) = delete;

    // Delivers what is there.
    void deliver() const;

    // Delivers until a condition holds; sleeps in between.
    void waitUntil(const std::function<bool()>& condition) const;

    // The same, until the time is up at the latest.
    //  result  whether it holds
    bool waitUntil(const std::function<bool()>& condition, const Deadline& deadline) const;

  private:
    GMainContext* const _context = g_main_context_new();
};

} // namespace welcomer::desktop
