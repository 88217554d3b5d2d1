// A signer's CMS message and the time-stamp token in it. The input is a byte with the length of the signed
// content, the content, and the message.
#include "base/byte_io.h"
#include "codesign/cms_signature.h"
#include "codesign/code_error.h"
#include "target.h"

namespace pinwell::fuzz {
namespace {

bool verifies(ByteView message, ByteView content) {
    try {
        codesign::requireDetachedCms(message, content);
        return true;
    } catch (const codesign::CodeError&) {
        return false;
    }
}

}  // namespace

void examine(ByteView input) {
    base::ByteReader reader(input);
    ByteView content;
    try {
        const std::uint8_t length = reader.u8("length of the content");
        content = reader.bytes(length, "content");
    } catch (const base::ShortRead&) {
        return;
    }
    const ByteView message = reader.bytes(reader.remaining(), "message");
    static_cast<void>(codesign::secureTimestamp(message));
    if (!verifies(message, content)) return;

    Data other = base::toData(content);
    other.push_back(std::byte{});
    require(!verifies(message, other), "a signature is over one content alone");
    Data longer = base::toData(message);
    longer.push_back(std::byte{});
    require(!verifies(longer, content), "nothing stands behind a message");
}

}  // namespace pinwell::fuzz
