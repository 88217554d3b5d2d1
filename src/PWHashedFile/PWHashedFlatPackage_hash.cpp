// The cdhash of a flat package: the digest that the archive's CMS signature signs. The only file of the tool
// that knows the archive library.
#include <xar/xar.h>

#include <cstdlib>
#include <memory>
#include <span>
#include <string_view>
#include <type_traits>

#include "foundation/handle.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "src/messages.h"

namespace pinwell {
namespace {

constexpr std::int32_t kReading = 0;
constexpr std::string_view kSignatureType = "CMS";

using Archive = foundation::Handle<std::remove_pointer_t<xar_t>, xar_close>;

struct Free {
    void operator()(std::uint8_t* bytes) const noexcept { std::free(bytes); }  // NOLINT(*-no-malloc)
};
using CopiedBytes = std::unique_ptr<std::uint8_t, Free>;

xar_signature_t firstCMSSignature(xar_t archive) {
    for (xar_signature_t signature = xar_signature_first(archive); signature != nullptr;
         signature = xar_signature_next(signature)) {
        const char* const type = xar_signature_type(signature);  // null if the archive has none
        const std::string_view text = type == nullptr ? "" : type;
        NoisyLog("Sig Type is %s. Length is %lu", type, text.size());
        if (text == kSignatureType) return signature;
    }
    return nullptr;
}

// By the length of the digest, because the archive's own name for its algorithm is not read.
std::uint32_t algorithmOfSize(const char* size) {
    constexpr int kDecimal = 10;
    switch (std::strtol(size, nullptr, kDecimal)) {
        case 20:
            return 1;
        case 32:
            return 2;
        default:
            return 0;
    }
}

// To read the archive's own properties, the library takes the archive's handle as a file handle.
const char* checksumSize(xar_t archive) {
    const char* size = nullptr;
    const auto status = xar_prop_get(reinterpret_cast<xar_file_t>(archive), "checksum/size", &size);
    return status == 0 && size != nullptr && *size != '\0' ? size : nullptr;
}

}  // namespace

std::optional<Data> PWHashedFlatPackage::_cdHash() {
    noteState();
    const Archive archive(xar_open(fileURL()->path().c_str(), kReading));
    if (!archive) return std::nullopt;

    const xar_signature_t signature = firstCMSSignature(archive.get());
    if (signature == nullptr) {
        NoisyLog("Could not find an appropriate \"code signature\" in the %@ installer package.", name());
        return std::nullopt;
    }
    std::uint8_t* copy = nullptr;
    std::uint32_t length = 0;
    // The low 8 bits are the code: the library's releases return it in types of different widths.
    const auto status = static_cast<std::uint8_t>(
        xar_signature_copy_signed_data(signature, &copy, &length, nullptr, nullptr, nullptr));
    const CopiedBytes signedData(copy);
    if (status != 0) {
        NoisyLog("Error %d prevented extracting package hash for package: %@", status, fileURL());
        return std::nullopt;
    }

    std::uint32_t algorithm = 0;
    if (const char* const size = checksumSize(archive.get()); size != nullptr) {
        NoisyLog("Package %@ uses a checksum of size %s", name(), size);
        algorithm = algorithmOfSize(size);
    }
    setDigestAlgorithm(algorithm);
    return foundation::toData(std::as_bytes(std::span(signedData.get(), length)));
}

}  // namespace pinwell
