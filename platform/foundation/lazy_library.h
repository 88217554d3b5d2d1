// Shared libraries that only some runs need, opened on demand.
//
// A linked library slows down every start of the program: it is mapped and relocated, with all its
// dependencies. A rarely needed library is opened here instead, and its functions are found by
// name.
#pragma once

namespace pinwell::foundation {

/// Opened by the constructor, never closed: a library may leave threads and exit handlers that need its
/// code.
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

}  // namespace pinwell::foundation
