# Third-party packages, all from Debian (scripts/install-deps.sh installs them).
find_package(PkgConfig REQUIRED)
find_package(Threads REQUIRED)
pkg_check_modules(CJSON REQUIRED IMPORTED_TARGET libcjson)
# The device library's strict reading of coherency requirements.
pkg_check_modules(JANSSON REQUIRED IMPORTED_TARGET jansson)
pkg_check_modules(MICROHTTPD REQUIRED IMPORTED_TARGET libmicrohttpd)
pkg_check_modules(LIBCURL REQUIRED IMPORTED_TARGET libcurl)

if(QUILLON_BUILD_TESTS)
  find_package(GTest REQUIRED)
  include(GoogleTest)
  # The Python checks use the distribution's interpreter, for which
  # scripts/install-deps.sh installs python3-jsonschema and python3-yaml.
  find_program(QUILLON_SYSTEM_PYTHON python3 PATHS /usr/bin NO_DEFAULT_PATH REQUIRED)
endif()
if(QUILLON_BUILD_BENCH)
  find_package(benchmark REQUIRED)
endif()
