#include "backends/desktop/accountserver/WipedMemory.h"

#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <curl/curl.h>
#include <malloc.h>

namespace welcomer::desktop {

namespace {

void freeWiped(void* memory) {
    if (memory) {
        ::explicit_bzero(memory, ::malloc_usable_size(memory));
        std::free(memory);
    }
}

// What moves leaves nothing behind.
void* reallocateWiped(void* memory, std::size_t size) {
    if (!memory) {
        return std::malloc(size);
    }
    void* const moved = std::malloc(size);
    if (moved) {
        std::memcpy(moved, memory, std::min(size, ::malloc_usable_size(memory)));
        freeWiped(memory);
    }
    return moved;
}

} // namespace

bool prepareCurl() {
    static const bool isPrepared = curl_global_init_mem(CURL_GLOBAL_DEFAULT, std::malloc, freeWiped,
                                                        reallocateWiped, ::strdup, std::calloc) == CURLE_OK;
    return isPrepared;
}

} // namespace welcomer::desktop
