// The running process: its name and environment, how it was built, and the libraries that it opens on demand.
#pragma once

#include <optional>
#include <string>

#include "values/url.h"

namespace pinwell::runtime {

/// The last component of the name that the process was started with.
std::string processName();

/// Opens closed standard streams on /dev/null. Otherwise the next opened connection or file
/// would take the number of a closed stream, and get the messages. Call it before anything is
/// opened.
void occupyStandardStreams();

/// A fresh UUID-like string (RFC 9562, version 4), upper case, from the kernel's random source.
std::string globallyUniqueString();

/// $TMPDIR if it is set and absolute, otherwise /tmp.
values::URL temporaryDirectory();

/// The variable's value. Returns `nullopt` if it is unset, or if the process has more rights than its caller
/// (set-user-ID), whose environment is then not trusted.
std::optional<std::string> secureEnvironment(const char* name);

/// A shared library that only some runs need. A linked library slows down every start of the program: it is
/// mapped and relocated, with all its dependencies. This one is opened on demand, and its functions are found
/// by name. Opened by the constructor, never closed: a library may leave threads and exit handlers that need
/// its code.
class LazyLibrary {
  public:
    explicit LazyLibrary(const char* name);
    LazyLibrary(const LazyLibrary&) = delete;
    LazyLibrary& operator=(const LazyLibrary&) = delete;

    /// Whether it could be opened, and every function so far was found.
    bool isComplete() const noexcept { return complete_; }

    /// Points `function` at the library's function of that name, or at null.
    template <class Function>
    void find(Function*& function, const char* name) {
        function = reinterpret_cast<Function*>(address(name));
    }

  private:
    void* address(const char* name);

    void* handle_;
    bool complete_;
};

/// Whether this build has a sanitizer with its own stacks, handlers, children or reports.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
constexpr bool kSanitized = true;
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
constexpr bool kSanitized = true;
#else
constexpr bool kSanitized = false;
#endif
#else
constexpr bool kSanitized = false;
#endif

}  // namespace pinwell::runtime
