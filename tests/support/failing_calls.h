// Provokes failures of the system's file calls. A test program with the target failing_calls is linked so
// that the calls named in CMakeLists.txt come through here (ld's --wrap). Outside a Trouble's life, and on
// other threads, they pass on. Reads and writes of the standard streams pass on too, because these are no
// files.
//
// Reasons for this way, instead of a preloaded library or a failing file manager:
// everything under test runs in the test's own process, so a run takes a millisecond, and a
// test can try every call and every errno. The count includes calls outside the file
// service, by the readers of archives and signatures. The code under test is compiled as
// for the product.
#pragma once

#include <cstddef>
#include <set>
#include <string>
#include <string_view>
#include <vector>

namespace pinwell::test {

class Trouble {
  public:
    /// The call of that number, counted from 0, fails with that errno.
    static Trouble atCall(std::size_t number, int reason);

    /// The call of that number moves three bytes at most, if it is a read, a write or a copy.
    static Trouble shortAtCall(std::size_t number);

    /// From the call of that number on, the volume is full, or broken if `reason` says so. If this
    /// call moves bytes, it moves three. After it nothing can be written, made durable, cut or
    /// extended.
    static Trouble fromCallOn(std::size_t number, int reason);

    /// Every call of these names fails with that errno.
    static Trouble atEvery(std::set<std::string> names, int reason);

    /// Every call that a signal can interrupt is interrupted the first time, and works when it is made again.
    static Trouble interruptions();

    /// All reads, writes and copies move three bytes at most.
    static Trouble shortCounts();

    /// All works; open files without close-on-exec are counted.
    static Trouble none();

    ~Trouble();
    Trouble(const Trouble&) = delete;
    Trouble& operator=(const Trouble&) = delete;

    /// The last call that was made to fail, or be short; empty when there was none.
    const std::string& failedCall() const noexcept { return failedCall_; }
    std::size_t callCount() const noexcept { return calls_; }
    std::size_t openedWithoutCloseOnExec() const noexcept { return inheritable_; }

    /// The paths flushed to stable storage, in order.
    const std::vector<std::string>& flushed() const noexcept { return flushed_; }

    // For the calls themselves.
    bool fails(const std::string& name);
    bool isShort() const noexcept;
    void noteOpening(int flags);
    void noteFlush(int file);

  private:
    enum class Kind { none, atCall, shortAtCall, fromCallOn, atEvery, interruptions, shortCounts };
    Trouble(Kind kind, std::size_t number, std::set<std::string> names, int reason);

    Kind kind_;
    std::size_t number_;
    std::set<std::string> names_;
    int reason_;
    std::size_t calls_ = 0;
    std::size_t inheritable_ = 0;
    std::string failedCall_;
    std::string interrupted_;
    std::vector<std::string> flushed_;
};

}  // namespace pinwell::test
