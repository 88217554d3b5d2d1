# PINWELL_SANITIZE is the value of -fsanitize=; empty builds without sanitizers.
add_library(pinwell_sanitizers INTERFACE)
if(PINWELL_SANITIZE)
  target_compile_options(pinwell_sanitizers INTERFACE
    -fsanitize=${PINWELL_SANITIZE} -fno-omit-frame-pointer -fno-sanitize-recover=all)
  target_link_options(pinwell_sanitizers INTERFACE -fsanitize=${PINWELL_SANITIZE})
endif()
