// OpenSSL for the .cpp files of this folder: the owners of its objects, and its errors as failures.
#pragma once

#include <openssl/pem.h>

#include <array>
#include <string_view>

#include "crypto/openssl.h"
#include "failure.h"
#include "values/format.h"

namespace pinwell::lumora {

using crypto::BioHandle;
using crypto::CertificateHandle;
using crypto::KeyHandle;
using crypto::ObjectHandle;
using crypto::textOf;
using crypto::unsignedBytes;

/// The library's last error, as the failure of `action`; empties the library's queue.
inline Failure openSSLFailure(std::string_view action) {
    std::array<char, 256> text{};
    ERR_error_string_n(ERR_get_error(), text.data(), text.size());
    ERR_clear_error();
    return {EX_SOFTWARE, values::format("cannot %@: %@", action, std::string_view(text.data()))};
}

/// Throws unless a library call has returned its success value.
inline void require(bool succeeded, std::string_view action) {
    if (!succeeded) throw openSSLFailure(action);
}

/// crypto::encodedBy(). Throws if the encoder fails.
template <class Object>
base::Data encodeDer(int (*encoder)(const Object*, unsigned char**), const Object* object,
                     std::string_view action) {
    base::Data der = crypto::encodedBy<Object>(encoder, object);
    require(!der.empty(), action);
    return der;
}

}  // namespace pinwell::lumora
