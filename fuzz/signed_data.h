// The bytes that a signature of a package archive signs.
#pragma once

#include <xar/xar.h>

#include <cstdlib>
#include <memory>
#include <span>

#include "target.h"

namespace pinwell::fuzz {

inline Data signedDataOf(xar_signature_t signature) {
    struct FreeMemory {
        void operator()(void* memory) const noexcept { std::free(memory); }
    };
    std::uint8_t* bytes = nullptr;
    std::uint32_t length = 0;
    const auto status = xar_signature_copy_signed_data(signature, &bytes, &length, nullptr, nullptr, nullptr);
    const std::unique_ptr<std::uint8_t, FreeMemory> owner(bytes);
    require(status == 0, "a signature signs something");
    return base::toData(std::as_bytes(std::span(bytes, length)));
}

}  // namespace pinwell::fuzz
