#include <xar/xar.h>

#include <algorithm>
#include <cstdlib>
#include <exception>
#include <memory>
#include <vector>

#include "xar/archive.h"

using pinwell::xar::Archive;

// A signature has its archive and its number, which lead to its style, the checksum and the next signature.
struct xar_archive_signature {
    xar_t archive;
    std::size_t number;
};

struct xar_archive {
    explicit xar_archive(std::unique_ptr<const Archive> opened) : contents(std::move(opened)) {
        for (std::size_t number = 0; number < contents->table().signatures.size(); ++number)
            signatures.push_back({this, number});
    }
    xar_archive(const xar_archive&) = delete;
    xar_archive& operator=(const xar_archive&) = delete;

    xar_signature_t signature(std::size_t number) const {
        return number < signatures.size() ? &signatures[number] : nullptr;
    }

    std::unique_ptr<const Archive> contents;
    std::vector<xar_archive_signature> signatures;
};

namespace {

constexpr int32_t kReading = 0;
constexpr int kFailure = -1;

}  // namespace

xar_t xar_open(const char* file, int32_t flags) {
    if (file == nullptr || flags != kReading) return nullptr;
    try {
        auto archive = Archive::open(file);
        return archive ? new xar_archive(std::move(archive)) : nullptr;
    } catch (const std::exception&) {
        return nullptr;
    }
}

int xar_close(xar_t x) {
    delete x;
    return 0;
}

xar_signature_t xar_signature_first(xar_t x) {
    return x->signature(0);
}

xar_signature_t xar_signature_next(xar_signature_t s) {
    return s->archive->signature(s->number + 1);
}

char* xar_signature_type(xar_signature_t s) {
    const auto& style = s->archive->contents->table().signatures[s->number];
    return style ? const_cast<char*>(style->c_str())
                 : nullptr;  // borrowed, though the prototype does not say so
}

uint8_t xar_signature_copy_signed_data(xar_signature_t sig, uint8_t** data, uint32_t* length,
                                       uint8_t** signed_data, uint32_t* signed_length,
                                       uint32_t* signed_offset) {
    constexpr auto kFailed = static_cast<uint8_t>(kFailure);
    if (data == nullptr || length == nullptr) return kFailed;
    if (signed_data != nullptr || signed_length != nullptr || signed_offset != nullptr) return kFailed;
    const auto& checksum = sig->archive->contents->checksum();
    if (checksum.empty()) return kFailed;
    // The caller frees it, as the prototype says.
    auto* const copy = static_cast<uint8_t*>(std::malloc(checksum.size()));  // NOLINT(*-no-malloc)
    if (copy == nullptr) return kFailed;
    std::transform(checksum.begin(), checksum.end(), copy,
                   [](std::byte byte) { return std::to_integer<uint8_t>(byte); });
    *data = copy;
    *length = static_cast<uint32_t>(checksum.size());
    return 0;
}

int32_t xar_prop_get(xar_file_t f, const char* key, const char** value) {
    if (value == nullptr) return kFailure;
    *value = nullptr;
    if (f == nullptr || key == nullptr) return kFailure;
    const xar_t archive = reinterpret_cast<xar_t>(f);
    const auto& properties = archive->contents->table().properties;
    const auto found = properties.find(std::string_view(key));
    if (found == properties.end()) return kFailure;
    if (found->second) *value = found->second->c_str();
    return 0;
}
