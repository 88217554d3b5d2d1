// Shared libraries that only some runs need, opened when one does.
//
// A library that is linked costs every start of the program: it is mapped and relocated with all that it
// depends on in turn. One that a run rarely reaches is opened here instead, and its functions are found by
// name.
#pragma once

namespace pinwell::foundation {

/// Opened when it is made, never closed: what a library leaves behind (threads, exit handlers) needs it
/// there.
class LazyLibrary {
  public:
    explicit LazyLibrary(const char* name);
    LazyLibrary(const LazyLibrary&) = delete;
    LazyLibrary& operator=(const LazyLibrary&) = delete;

    /// Whether it could be opened, and every function asked for so far was there.
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
