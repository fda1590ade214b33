/* A library through which every structure of the interface can be seen, whichever header it is compiled with. */

#include <welcomer/delegate_plugin.h>

#define VISIBLE __attribute__((visibility("default")))

VISIBLE void wl_probe(const wl_host* host, const wl_delegate* delegate,
                      const wl_delegate_plugin_descriptor* descriptor, const wl_completion_handler* handler);
void wl_probe(const wl_host* host, const wl_delegate* delegate,
              const wl_delegate_plugin_descriptor* descriptor, const wl_completion_handler* handler) {
    (void)host;
    (void)delegate;
    (void)descriptor;
    (void)handler;
}
