# Warnings for our own code; third-party headers come in as system headers.
add_library(quillon_warnings INTERFACE)
target_compile_options(quillon_warnings INTERFACE -Wall -Wextra -Werror)

# quillon_library(<name> SOURCES <files...> [DEPS <targets...>] [PRIVATE_DEPS <targets...>])
# A static library of our code. Its folder's parent is on the include path, so
# headers are included as "<folder>/<header>.h".
function(quillon_library name)
  cmake_parse_arguments(ARG "" "" "SOURCES;DEPS;PRIVATE_DEPS" ${ARGN})
  add_library(${name} STATIC ${ARG_SOURCES})
  target_include_directories(${name} PUBLIC ${PROJECT_SOURCE_DIR}/src)
  target_link_libraries(${name} PUBLIC ${ARG_DEPS} PRIVATE quillon_warnings ${ARG_PRIVATE_DEPS})
endfunction()

# quillon_test(<name> SOURCES <files...> [LIBS <targets...>] [TIMEOUT <seconds>])
# One GoogleTest program, run by CTest as one test.
function(quillon_test name)
  cmake_parse_arguments(ARG "" "TIMEOUT" "SOURCES;LIBS" ${ARGN})
  if(NOT ARG_TIMEOUT)
    set(ARG_TIMEOUT 300)
  endif()
  add_executable(${name} ${ARG_SOURCES})
  target_include_directories(${name} PRIVATE ${PROJECT_SOURCE_DIR}/tests)
  target_link_libraries(${name} PRIVATE ${ARG_LIBS} quillon_warnings
                        GTest::gmock GTest::gtest_main Threads::Threads)
  add_test(NAME ${name} COMMAND ${name})
  set_tests_properties(${name} PROPERTIES TIMEOUT ${ARG_TIMEOUT})
endfunction()

# quillon_benchmark(<name> SOURCES <files...> [LIBS <targets...>])
function(quillon_benchmark name)
  cmake_parse_arguments(ARG "" "" "SOURCES;LIBS" ${ARGN})
  add_executable(${name} ${ARG_SOURCES})
  target_link_libraries(${name} PRIVATE ${ARG_LIBS} quillon_warnings benchmark::benchmark)
endfunction()

# quillon_fuzzer(<name> SOURCES <files...> [LIBS <targets...>] [INCLUDES <dirs...>])
# A libFuzzer target in the fuzz build. In the test build, the same sources
# linked with a replay main instead: when fuzz/corpus/<folder>/ exists
# (<folder> being the name of the target's folder under fuzz/), CTest replays
# every input of it once, as <name>_replay.
function(quillon_fuzzer name)
  cmake_parse_arguments(ARG "" "" "SOURCES;LIBS;INCLUDES" ${ARGN})
  get_filename_component(folder ${CMAKE_CURRENT_SOURCE_DIR} NAME)
  set(corpus ${PROJECT_SOURCE_DIR}/fuzz/corpus/${folder})
  if(QUILLON_BUILD_FUZZ)
    add_executable(${name} ${ARG_SOURCES})
    target_include_directories(${name} PRIVATE ${ARG_INCLUDES})
    target_link_libraries(${name} PRIVATE ${ARG_LIBS} quillon_warnings)
    target_link_options(${name} PRIVATE -fsanitize=fuzzer)
  elseif(QUILLON_BUILD_TESTS AND IS_DIRECTORY ${corpus})
    add_executable(${name}_replay ${ARG_SOURCES} ${PROJECT_SOURCE_DIR}/fuzz/replay_main.cc)
    target_include_directories(${name}_replay PRIVATE ${ARG_INCLUDES})
    target_link_libraries(${name}_replay PRIVATE ${ARG_LIBS} quillon_warnings)
    add_test(NAME ${name}_replay COMMAND ${name}_replay ${corpus})
    set_tests_properties(${name}_replay PROPERTIES TIMEOUT 120)
  endif()
endfunction()

# quillon_test_in_locales(<test>)
# Runs the test program <test> twice more: under Turkish (where "I" does not
# fold to "i") and under a locale whose decimal separator is a comma. Both
# are compiled into the build tree, so the runs do not depend on what the
# machine has installed.
function(quillon_test_in_locales name)
  # status_reader_test names this folder too.
  set(locale_dir ${CMAKE_BINARY_DIR}/test-locales)
  if(NOT TARGET quillon_test_locales)
    find_program(LOCALEDEF localedef REQUIRED)
    set(outputs)
    foreach(locale tr_TR de_DE)
      add_custom_command(
        OUTPUT ${locale_dir}/${locale}.UTF-8/LC_CTYPE
        COMMAND ${LOCALEDEF} -i ${locale} -f UTF-8 ${locale_dir}/${locale}.UTF-8 || test -f ${locale_dir}/${locale}.UTF-8/LC_CTYPE
        COMMENT "Compiling the ${locale}.UTF-8 locale for the tests")
      list(APPEND outputs ${locale_dir}/${locale}.UTF-8/LC_CTYPE)
    endforeach()
    add_custom_target(quillon_test_locales ALL DEPENDS ${outputs})
  endif()
  target_sources(${name} PRIVATE ${PROJECT_SOURCE_DIR}/tests/support/locale_from_environment.cc)
  add_dependencies(${name} quillon_test_locales)
  get_test_property(${name} TIMEOUT timeout)
  foreach(variant "tr_TR" "comma;de_DE")
    list(GET variant 0 suffix)
    list(GET variant -1 locale)
    add_test(NAME ${name}_${suffix} COMMAND ${name})
    set_tests_properties(${name}_${suffix} PROPERTIES TIMEOUT ${timeout}
      ENVIRONMENT "LOCPATH=${locale_dir};QUILLON_TEST_LOCALE=${locale}.UTF-8")
  endforeach()
endfunction()
