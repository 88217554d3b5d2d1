// Compiled into the programs of a ThreadSanitizer build that use the HTTP library. The library itself is not
// instrumented. When two threads first use one of its static tables, the sanitizer sees both access it
// through memcpy and memcmp, but does not see the guard between them. The sanitizer calls the function by its
// name.
// NOLINTBEGIN(bugprone-reserved-identifier)
extern "C" const char* __tsan_default_suppressions();

extern "C" const char* __tsan_default_suppressions() {
    return "called_from_lib:libcpp-httplib.so\n";
}
// NOLINTEND(bugprone-reserved-identifier)
