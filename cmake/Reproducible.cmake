# The same source gives the same executables, whatever the paths of the source and build folders. Debug builds keep the
# real paths, which debuggers and coverage reports need. If two maps fit, the later one counts.
add_compile_options($<$<NOT:$<CONFIG:Debug>>:-ffile-prefix-map=${CMAKE_SOURCE_DIR}=.>
                    $<$<NOT:$<CONFIG:Debug>>:-ffile-prefix-map=${CMAKE_BINARY_DIR}=./build>)
