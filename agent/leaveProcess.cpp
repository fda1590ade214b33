#include "agent/leaveProcess.h"

#include <cstdlib>

#ifdef WELCOMER_FLUSH_AT_EXIT
// Each is there when the program was built with the tool that brings it.
extern "C" {
[[gnu::weak]] void __gcov_dump();
[[gnu::weak]] int __llvm_profile_write_file();
[[gnu::weak]] void __lsan_do_leak_check();
}
#endif

namespace welcomer {

void leaveProcess(int status) {
#ifdef WELCOMER_FLUSH_AT_EXIT
    if (__gcov_dump) {
        __gcov_dump();
    }
    if (__llvm_profile_write_file) {
        __llvm_profile_write_file();
    }
    if (__lsan_do_leak_check) {
        __lsan_do_leak_check();
    }
#endif
    std::_Exit(status);
}

} // namespace welcomer
