# Hardening for programs that read hostile files. The sanitizers have their own checks, and _FORTIFY_SOURCE hides some
# of these, so a sanitized build is not hardened.
add_library(pinwell_hardening INTERFACE)
if(NOT PINWELL_SANITIZE)
  target_compile_options(pinwell_hardening INTERFACE
    -fstack-protector-strong
    $<$<NOT:$<CONFIG:Debug>>:-U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=2>)
  if(CMAKE_SYSTEM_PROCESSOR MATCHES "x86_64|AMD64")
    target_compile_options(pinwell_hardening INTERFACE -fcf-protection=full)
  endif()
  target_link_options(pinwell_hardening INTERFACE -Wl,-z,relro,-z,now -Wl,--as-needed)
endif()
include(CheckPIESupported)
check_pie_supported()
