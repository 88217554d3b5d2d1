#include "foundation/lazy_library.h"

#include <dlfcn.h>

namespace pinwell::foundation {

LazyLibrary::LazyLibrary(const char* name)
    : handle_(dlopen(name, RTLD_LAZY)), complete_(handle_ != nullptr) {}

void* LazyLibrary::address(const char* name) {
    void* const found = handle_ == nullptr ? nullptr : dlsym(handle_, name);
    complete_ = complete_ && found != nullptr;
    return found;
}

}  // namespace pinwell::foundation
