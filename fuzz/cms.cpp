// A signer's CMS message and the time-stamp token in it. The input is a byte that says how long the signed
// content is, the content, and the message.
#include "codesign/cms_signature.h"
#include "foundation/byte_reader.h"
#include "target.h"

namespace pinwell::fuzz {

void examine(ByteView input) {
    foundation::ByteReader reader(input);
    ByteView content;
    try {
        const std::uint8_t length = reader.u8("length of the content");
        content = reader.bytes(length, "content");
    } catch (const foundation::ShortRead&) {
        return;
    }
    const ByteView message = reader.bytes(reader.remaining(), "message");
    static_cast<void>(codesign::secureTimestamp(message));
    if (!codesign::verifyDetachedCms(message, content)) return;

    Data other = foundation::toData(content);
    other.push_back(std::byte{});
    require(!codesign::verifyDetachedCms(message, other), "a signature is over one content alone");
    Data longer = foundation::toData(message);
    longer.push_back(std::byte{});
    require(!codesign::verifyDetachedCms(longer, content), "nothing stands behind a message");
}

}  // namespace pinwell::fuzz
