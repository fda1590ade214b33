#include "tools/resolver-sync/FolderWatch.h"

#include <filesystem>
#include <sys/inotify.h>
#include <system_error>
#include <systemd/sd-event.h>

namespace welcomer::resolver {

namespace {

constexpr std::uint32_t kEntries = IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO | IN_ONLYDIR;
constexpr std::uint32_t kContent = IN_MODIFY | IN_CLOSE_WRITE | IN_ATTRIB | IN_DELETE_SELF | IN_MOVE_SELF;

} // namespace

void FolderWatch::DropSource::operator()(sd_event_source* source) const {
    sd_event_source_disable_unref(source);
}

FolderWatch::FolderWatch(sd_event* event, const std::string& folder, std::function<void()> changed)
    : _event(event),
      _folder(folder),
      _name(std::filesystem::path(folder).filename()),
      _changed(std::move(changed)) {
    const std::string above = std::filesystem::path(folder).parent_path();
    sd_event_source* source = nullptr;
    const int result = sd_event_add_inotify(_event, &source, above.c_str(), kEntries, _toldAbove, this);
    if (result < 0) {
        throw std::system_error(-result, std::generic_category(), above);
    }
    _above.reset(source);
}

FolderWatch::~FolderWatch() = default;

void FolderWatch::rearm() {
    sd_event_source* source = nullptr;
    sd_event_add_inotify(_event, &source, _folder.c_str(), kEntries | kContent, _toldInside, this);
    _inside.reset(source);
}

int FolderWatch::_toldAbove(sd_event_source* /*source*/, const inotify_event* told, void* self) {
    const auto* const watch = static_cast<const FolderWatch*>(self);
    const bool lost = (told->mask & IN_Q_OVERFLOW) != 0;
    if (lost || (told->len > 0 && watch->_name == static_cast<const char*>(told->name))) {
        watch->_changed();
    }
    return 0;
}

int FolderWatch::_toldInside(sd_event_source* /*source*/, const inotify_event* /*told*/, void* self) {
    static_cast<const FolderWatch*>(self)->_changed();
    return 0;
}

} // namespace welcomer::resolver
