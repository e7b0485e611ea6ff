# Build flavours. The presets in CMakePresets.json pick among these.
option(QUILLON_BUILD_TESTS "Build the GoogleTest suites" ON)
option(QUILLON_BUILD_BENCH "Build the Google Benchmark programs" OFF)
option(QUILLON_BUILD_FUZZ "Build the libFuzzer targets (Clang only)" OFF)
set(QUILLON_SANITIZE "" CACHE STRING
    "Sanitizers for every target: empty, 'address;undefined' or 'thread'")

if(NOT CMAKE_BUILD_TYPE AND NOT CMAKE_CONFIGURATION_TYPES)
  set(CMAKE_BUILD_TYPE RelWithDebInfo CACHE STRING "Build type" FORCE)
endif()

# GCC gives the static locals of inline library templates "unique" binding,
# which makes the loader keep a library that has one mapped for good; the
# platform libraries must unload with the plug-in that loaded them.
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  add_compile_options($<$<COMPILE_LANGUAGE:CXX>:-fno-gnu-unique>)
endif()

if(QUILLON_SANITIZE)
  list(JOIN QUILLON_SANITIZE "," sanitizers)
  add_compile_options(-fsanitize=${sanitizers} -fno-omit-frame-pointer)
  add_link_options(-fsanitize=${sanitizers})
  if("undefined" IN_LIST QUILLON_SANITIZE)
    # Any undefined behaviour fails the run instead of printing and going on.
    add_compile_options(-fno-sanitize-recover=all)
  endif()
endif()

if(QUILLON_BUILD_FUZZ)
  if(NOT CMAKE_CXX_COMPILER_ID STREQUAL "Clang")
    message(FATAL_ERROR "The fuzz targets need Clang (use the 'fuzz' preset)")
  endif()
  add_compile_options(-fsanitize=fuzzer-no-link,address,undefined -fno-omit-frame-pointer)
  add_link_options(-fsanitize=address,undefined)
endif()
