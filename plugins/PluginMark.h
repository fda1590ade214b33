// Which plug-in a thread is in, for whoever has to say so when the process ends there.

#pragma once

namespace welcomer {

// Marks the calling thread as being in a plug-in, in its library's initialisers or in one of its functions,
// for as long as this object lives. Marks nest: at its end the thread is where it was before. A thread of a
// plug-in's own has no mark.
class PluginMark {
  public:
    //  name  of the plug-in; borrowed, must outlive this object
    explicit PluginMark(const char* name) noexcept;
    ~PluginMark();
    PluginMark(const PluginMark&) = delete;
    PluginMark& operator=(const PluginMark&) = delete;

    // The name of the plug-in that the calling thread is in, or null. Signal handlers may call it.
    static const char* current() noexcept;

  private:
    const char* const _outer;
};

} // namespace welcomer
