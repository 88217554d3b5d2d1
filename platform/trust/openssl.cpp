#include "trust/openssl.h"

#include <malloc.h>
#include <openssl/crypto.h>

#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <cstring>

namespace pinwell::trust {
namespace {

void* allocate(std::size_t size, const char*, int) {
    return std::malloc(size);
}

void release(void* memory, const char*, int) {
    if (memory == nullptr) return;
    OPENSSL_cleanse(memory, malloc_usable_size(memory));
    std::free(memory);
}

// Without realloc(3), which does not wipe the old memory when it moves.
void* reallocate(void* memory, std::size_t size, const char* file, int line) {
    void* const moved = size == 0 ? nullptr : std::malloc(size);
    if (memory == nullptr) return moved;
    if (size != 0 && moved == nullptr) return nullptr;
    if (moved != nullptr) std::memcpy(moved, memory, std::min(size, malloc_usable_size(memory)));
    release(memory, file, line);
    return moved;
}

}  // namespace

bool wipeWhatOpenSSLFrees() noexcept {
    return CRYPTO_set_mem_functions(allocate, reallocate, release) == 1;
}

}  // namespace pinwell::trust
