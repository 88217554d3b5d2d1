#include "foundation/utf8.h"

namespace pinwell::foundation {
namespace {

// The bytes after a lead byte: the length of the sequence, and the range of the second byte. This range
// excludes overlong forms (E0, F0), surrogates (ED) and values past the last code point (F4).
struct Sequence {
    std::size_t length = 0;
    unsigned char low = 0x80;
    unsigned char high = 0xBF;
};

Sequence sequenceFor(unsigned char lead) noexcept {
    if (lead < 0x80) return {1};
    if (lead >= 0xC2 && lead <= 0xDF) return {2};
    if (lead == 0xE0) return {3, 0xA0, 0xBF};
    if (lead == 0xED) return {3, 0x80, 0x9F};
    if (lead >= 0xE1 && lead <= 0xEF) return {3};
    if (lead == 0xF0) return {4, 0x90, 0xBF};
    if (lead >= 0xF1 && lead <= 0xF3) return {4};
    if (lead == 0xF4) return {4, 0x80, 0x8F};
    return {};
}

}  // namespace

std::size_t utf8SequenceLength(std::string_view text) noexcept {
    if (text.empty()) return 0;
    const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(text[i]); };
    const Sequence sequence = sequenceFor(byte(0));
    if (sequence.length > text.size()) return 0;
    if (sequence.length > 1 && (byte(1) < sequence.low || byte(1) > sequence.high)) return 0;
    for (std::size_t i = 2; i < sequence.length; ++i)
        if (byte(i) < 0x80 || byte(i) > 0xBF) return 0;
    return sequence.length;
}

bool isControlCharacter(std::string_view sequence) noexcept {
    const auto first = static_cast<unsigned char>(sequence[0]);
    if (sequence.size() == 1) return first < 0x20 || first == 0x7F;
    return sequence.size() == 2 && first == 0xC2 && static_cast<unsigned char>(sequence[1]) < 0xA0;
}

bool isUTF8(std::string_view text) noexcept {
    while (!text.empty()) {
        const std::size_t length = utf8SequenceLength(text);
        if (length == 0) return false;
        text.remove_prefix(length);
    }
    return true;
}

}  // namespace pinwell::foundation
