// Watching a folder that comes and goes.

#pragma once

#include <functional>
#include <memory>
#include <string>

struct inotify_event;
struct sd_event;
struct sd_event_source;

namespace welcomer::resolver {

// Tells of changes in a folder and of its own coming and going. Everything between two calls of `rearm` is
// told of, so whoever looks at the folder after `rearm`, and again after each change, ends with what is
// there. One thread, the event loop's.
class FolderWatch {
  public:
    // Watches for the folder's coming; `rearm` watches the folder itself.
    //  event    the loop; borrowed
    //  changed  called by the loop, once or more for each change
    // Throws std::system_error when the folder above cannot be watched.
    FolderWatch(sd_event* event, const std::string& folder, std::function<void()> changed);
    ~FolderWatch();
    FolderWatch(const FolderWatch&) = delete;
    FolderWatch& operator=(const FolderWatch&) = delete;

    // Watches the folder that is there now.
    void rearm();

  private:
    struct DropSource {
        void operator()(sd_event_source* source) const;
    };
    using Source = std::unique_ptr<sd_event_source, DropSource>;

    static int _toldAbove(sd_event_source* source, const inotify_event* told, void* self);
    static int _toldInside(sd_event_source* source, const inotify_event* told, void* self);

    sd_event* const _event;
    const std::string _folder;
    const std::string _name; // the folder's own name in the folder above
    const std::function<void()> _changed;
    Source _above;
    Source _inside; // none while there is no folder
};

} // namespace welcomer::resolver
