// Trouble with the system's file calls, made on purpose. The test program is linked so that the calls named
// in its CMakeLists.txt come through here (ld's --wrap); outside a Trouble's life, and on other threads, they
// pass on.
#pragma once

#include <cstddef>
#include <set>
#include <string>
#include <string_view>

namespace pinwell::test {

class Trouble {
  public:
    /// The call of that number, counted from 0, fails with that errno.
    static Trouble atCall(std::size_t number, int reason);

    /// Every call of these names fails with that errno.
    static Trouble atEvery(std::set<std::string> names, int reason);

    /// Every call that a signal can interrupt is interrupted the first time, and works when it is made again.
    static Trouble interruptions();

    /// Reads, writes and copies move three bytes at most.
    static Trouble shortCounts();

    /// All works; open files without close-on-exec are counted.
    static Trouble none();

    ~Trouble();
    Trouble(const Trouble&) = delete;
    Trouble& operator=(const Trouble&) = delete;

    /// The last call that was made to fail; empty when there was none.
    const std::string& failedCall() const noexcept { return failedCall_; }
    std::size_t callCount() const noexcept { return calls_; }
    std::size_t openedWithoutCloseOnExec() const noexcept { return inheritable_; }

    // For the calls themselves.
    bool fails(const std::string& name);
    bool isShort() const noexcept { return kind_ == Kind::shortCounts; }
    void noteOpening(int flags);

  private:
    enum class Kind { none, atCall, atEvery, interruptions, shortCounts };
    Trouble(Kind kind, std::size_t number, std::set<std::string> names, int reason);

    Kind kind_;
    std::size_t number_;
    std::set<std::string> names_;
    int reason_;
    std::size_t calls_ = 0;
    std::size_t inheritable_ = 0;
    std::string failedCall_;
    std::string interrupted_;
};

}  // namespace pinwell::test
