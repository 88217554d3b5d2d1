// Defers signals that would end the process until a write or another critical step is complete.
#pragma once

namespace pinwell::foundation {

/// While it lives, SIGHUP, SIGINT, SIGTERM and SIGXCPU have no effect; signals that came take effect when it
/// is destroyed. A signal that the process ignores stays ignored.
///
/// It changes the signals' handlers, not the masks. Each thread has its own mask, and a signal ends the
/// process through any thread that does not block it, for example a waiting main thread. A process has one
/// set of handlers, so there must be only one deferral at a time.
class SignalDeferral {
  public:
    SignalDeferral();
    ~SignalDeferral();
    SignalDeferral(const SignalDeferral&) = delete;
    SignalDeferral& operator=(const SignalDeferral&) = delete;
};

}  // namespace pinwell::foundation
