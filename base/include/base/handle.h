// Owners of what a library or the system hands out: the objects of C libraries, and file descriptors.
#pragma once

#include <unistd.h>

#include <memory>
#include <utility>

namespace pinwell::base {

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

/// Owns a file descriptor; -1 is none.
class FileDescriptor {
  public:
    FileDescriptor() = default;
    explicit FileDescriptor(int number) noexcept : number_(number) {}
    FileDescriptor(FileDescriptor&& other) noexcept : number_(std::exchange(other.number_, -1)) {}
    FileDescriptor& operator=(FileDescriptor&& other) noexcept {
        if (this != &other) {
            reset();
            number_ = std::exchange(other.number_, -1);
        }
        return *this;
    }
    ~FileDescriptor() { reset(); }

    int get() const noexcept { return number_; }
    explicit operator bool() const noexcept { return number_ >= 0; }
    int release() noexcept { return std::exchange(number_, -1); }
    void reset() noexcept {
        if (number_ >= 0) ::close(number_);
        number_ = -1;
    }

  private:
    int number_ = -1;
};

}  // namespace pinwell::base
