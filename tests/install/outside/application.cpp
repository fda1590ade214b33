// A setup application in small: it reads a property list and lists the delegate plug-ins below a root folder.
//   --without-platform   forgets to build the platform first

#include "backends/Backends.h"
#include "plugins/WLNimbusDelegatePlugins.h"
#include "propertylist/PropertyListReader.h"
#include "text/Describe.h"

#include <iostream>
#include <string_view>

int main(int argc, char** argv) {
    if (argc > 1 && argv[1] == std::string_view("--without-platform")) {
        return welcomer::WLNimbusDelegatePlugins().empty() ? 0 : 1;
    }
    welcomer::PlatformOptions options;
    options.root = argc > 1 ? argv[1] : "/";
    const auto owner = welcomer::buildPlatform(options);
    const welcomer::platform::ScopedPlatform installed(owner->platform());

    for (const auto& plugin : welcomer::WLNimbusDelegatePlugins()) {
        std::cout << "plug-in: " << plugin->delegateIdentifier().value_or("none") << '\n';
    }
    const auto result = welcomer::readPropertyList("{ answer = 42; }");
    if (!result) {
        std::cerr << result.error << '\n';
        return 1;
    }
    std::cout << "value: " << welcomer::text::describe(*result.value) << '\n';
    return 0;
}
