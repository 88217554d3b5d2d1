// A package archive: header, compressed table of contents, signatures and checksum.
#include <xar/xar.h>

#include <cstdlib>
#include <cstring>
#include <memory>

#include "scratch_file.h"
#include "target.h"

namespace pinwell::fuzz {
namespace {

constexpr std::uint32_t kLongestChecksum = 64;

struct FreeMemory {
    void operator()(void* memory) const noexcept { std::free(memory); }
};

void examineSignature(xar_signature_t signature) {
    if (const char* type = xar_signature_type(signature)) static_cast<void>(std::strlen(type));
    std::uint8_t* bytes = nullptr;
    std::uint32_t length = 0;
    const auto status = xar_signature_copy_signed_data(signature, &bytes, &length, nullptr, nullptr, nullptr);
    const std::unique_ptr<std::uint8_t, FreeMemory> owner(bytes);
    if (status != 0) return;
    require(bytes != nullptr && length > 0 && length <= kLongestChecksum, "what is signed is a checksum");
}

}  // namespace

void examine(ByteView input) {
    const ScratchFile file(input);
    xar_t archive = xar_open(file.path().c_str(), 0);
    if (archive == nullptr) return;
    std::size_t count = 0;
    for (auto signature = xar_signature_first(archive); signature != nullptr;
         signature = xar_signature_next(signature)) {
        examineSignature(signature);
        ++count;
    }
    require(count <= std::size_t{1} << 16U, "signatures are counted");
    for (const char* key : {"checksum", "checksum/size", "creation-time", ""}) {
        const char* value = nullptr;
        if (xar_prop_get(reinterpret_cast<xar_file_t>(archive), key, &value) == 0 && value != nullptr)
            static_cast<void>(std::strlen(value));
    }
    require(xar_close(archive) == 0, "an archive can be closed");
}

}  // namespace pinwell::fuzz
