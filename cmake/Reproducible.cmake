# The same source gives the same executables, whatever the folders are called in which they are built. Debug builds keep
# the real paths, which debuggers and coverage reports need. Of two maps that fit, the later one counts.
add_compile_options($<$<NOT:$<CONFIG:Debug>>:-ffile-prefix-map=${CMAKE_SOURCE_DIR}=.>
                    $<$<NOT:$<CONFIG:Debug>>:-ffile-prefix-map=${CMAKE_BINARY_DIR}=./build>)
