// Owning pointers to the objects of C libraries.
#pragma once

#include <memory>

namespace pinwell::foundation {

/// Frees an object with its library's function.
template <auto release>
struct Releaser {
    template <class T>
    void operator()(T* object) const noexcept {
        release(object);
    }
};

/// `Handle<X509, X509_free>` owns a certificate.
template <class T, auto release>
using Handle = std::unique_ptr<T, Releaser<release>>;

}  // namespace pinwell::foundation
