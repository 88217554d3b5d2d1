// The published ECDSA signatures of RFC 6979, A.2.5 (P-256, SHA-256), and functions to encode signatures.
#pragma once

#include <string>
#include <string_view>

#include "base/byte_io.h"
#include "trust/certificate.h"

namespace pinwell::trust {

inline constexpr std::size_t kField = 72;

inline Data fromHex(std::string_view text) {
    Data data;
    for (std::size_t i = 0; i + 1 < text.size(); i += 2) {
        data.push_back(static_cast<std::byte>(std::stoul(std::string(text.substr(i, 2)), nullptr, 16)));
    }
    return data;
}

inline constexpr std::string_view kPublicX =
    "60FED4BA255A9D31C961EB74C6356D68C049B8923B61FA6CE669622E60F29FB6";
inline constexpr std::string_view kPublicY =
    "7903FE1008B8BC99A41AE9E95628BC64F2F1B20C2D7E9F5177A3C294D4462299";
inline constexpr std::string_view kSampleR =
    "EFD48B2AACB6A8FD1140DD9CD45E81D69D2C877B56AAF991C34D0EA84EAF3716";
inline constexpr std::string_view kSampleS =
    "F7CB1C942D657C41D436C7A1B6E29F65F3E900DBB9AFF4064DC4AB2F843ACDA8";
inline constexpr std::string_view kTestR = "F1ABB023518351CD71D881567B1EA663ED3EFCF6C5132B354F28D3B0B7D38367";
inline constexpr std::string_view kTestS = "019F4113742A2B14BD25926B49C649155F267E60D3814B4C0CC84250E46F0083";
inline constexpr std::string_view kOrder = "FFFFFFFF00000000FFFFFFFFFFFFFFFFBCE6FAADA7179E84F3B9CAC2FC632551";

inline X509PublicKey sampleKey() {
    const Data info = base::ByteWriter()
                          .bytes(fromHex("3059301306072A8648CE3D020106082A8648CE3D03010703420004"))
                          .bytes(fromHex(kPublicX))
                          .bytes(fromHex(kPublicY))
                          .data();
    return *X509PublicKey::fromSubjectPublicKeyInfo(info);
}

inline Data element(std::uint8_t tag, const Data& contents) {
    return base::ByteWriter().u8(tag).u8(static_cast<std::uint8_t>(contents.size())).bytes(contents).data();
}
inline Data integer(std::string_view hex) {
    return element(0x02, fromHex(hex));
}
inline Data positive(std::string_view hex) {
    return integer((hex[0] >= '8' ? "00" : "") + std::string(hex));
}
inline Data sequence(const Data& first, const Data& second, const Data& behind = {}) {
    return element(0x30, base::ByteWriter().bytes(first).bytes(second).bytes(behind).data());
}
inline Data padded(Data signature, std::size_t size = kField) {
    signature.resize(size);
    return signature;
}

}  // namespace pinwell::trust
