// The subject of the tests of a signer's message: one content, and a valid message over it in parts.
#pragma once

#include <string_view>

#include "support/cms_parts.h"
#include "support/cms_signer.h"
#include "support/ticket_builder.h"

namespace pinwell::test {

inline const Data kContent = base::toData("a code directory");

inline constexpr std::string_view kTimeStampContent = "\x2A\x86\x48\x86\xF7\x0D\x01\x09\x10\x01\x04";

inline CmsParts goodParts() {
    return CmsParts::of(CmsBuilder(kContent).build());
}

inline CmsSignerParts& signerOf(CmsParts& parts) {
    return parts.signers.front();
}

inline Data identifier(std::string_view contents) {
    return derElement(0x06, base::asBytes(contents));
}

inline Data number(int value) {
    return derElement(0x02, Data{static_cast<std::byte>(value)});
}

}  // namespace pinwell::test
