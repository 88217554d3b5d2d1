# PINWELL_SANITIZE is the value of -fsanitize=; empty builds without sanitizers. The sources of a target with the
# property PINWELL_UNSANITIZED are compiled without them.
add_library(pinwell_sanitizers INTERFACE)
if(PINWELL_SANITIZE)
  set(sanitized "$<NOT:$<BOOL:$<TARGET_PROPERTY:PINWELL_UNSANITIZED>>>")
  target_compile_options(pinwell_sanitizers INTERFACE
    $<${sanitized}:-fsanitize=${PINWELL_SANITIZE}> $<${sanitized}:-fno-omit-frame-pointer>
    $<${sanitized}:-fno-sanitize-recover=all>)
  target_link_options(pinwell_sanitizers INTERFACE -fsanitize=${PINWELL_SANITIZE})
endif()
