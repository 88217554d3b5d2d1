// Signals that would end the process, put off until something is finished that must not be left half done.
#pragma once

namespace pinwell::foundation {

/// For as long as it lives, SIGHUP, SIGINT, SIGTERM and SIGXCPU have no effect; those that came have it when
/// it dies. A signal that the process ignores stays ignored.
///
/// It changes what the signals do, and not which are blocked: a mask is each thread's own, and a signal that
/// is meant for the process ends it through any thread that does not block it, a parked main thread for
/// instance. The process has one set of dispositions, so there must be one deferral at a time.
class SignalDeferral {
  public:
    SignalDeferral();
    ~SignalDeferral();
    SignalDeferral(const SignalDeferral&) = delete;
    SignalDeferral& operator=(const SignalDeferral&) = delete;
};

}  // namespace pinwell::foundation
