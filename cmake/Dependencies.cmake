# Every library from outside, found in one place. ARCHITECTURE.md says what each is for.
find_package(Threads REQUIRED)
find_package(PkgConfig REQUIRED)
find_package(OpenSSL 3.0 REQUIRED)
find_package(CURL 7.87 REQUIRED)
find_package(fmt REQUIRED)
find_package(nlohmann_json 3.10 REQUIRED)
pkg_check_modules(GIO REQUIRED IMPORTED_TARGET gio-2.0>=2.66)
find_package(EXPAT 2.5 REQUIRED)
find_package(ZLIB REQUIRED)
pkg_check_modules(RE2 REQUIRED IMPORTED_TARGET re2)
pkg_check_modules(SECCOMP REQUIRED IMPORTED_TARGET libseccomp>=2.5)

# The companions alone.
find_path(TOMLPLUSPLUS_INCLUDE_DIR toml++/toml.h REQUIRED)  # a header

# The local record service alone.
find_package(SQLiteCpp REQUIRED)
find_package(SQLite3 REQUIRED)
find_package(CLI11 REQUIRED)
find_package(Boost 1.74 REQUIRED CONFIG)

if(PINWELL_BUILD_TESTS)
  find_package(GTest REQUIRED)
  pkg_check_modules(HTTPLIB REQUIRED IMPORTED_TARGET cpp-httplib>=0.11)
  include(GoogleTest)
endif()
