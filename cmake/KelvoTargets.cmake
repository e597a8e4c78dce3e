# How every target of the project is compiled, said once.

add_library(kelvo_compile INTERFACE)
target_compile_options(kelvo_compile INTERFACE
  -Wall -Wextra -Wpedantic -Wconversion -Wshadow
  $<$<BOOL:${KELVO_WERROR}>:-Werror>
  # Objects for link-time optimisation hold ordinary code too, whoever asks for it.
  $<$<CXX_COMPILER_ID:GNU>:-ffat-lto-objects>)
if(KELVO_SANITIZE)
  target_compile_options(kelvo_compile INTERFACE
    -fsanitize=${KELVO_SANITIZE} -fno-sanitize-recover=all -fno-omit-frame-pointer)
  target_link_options(kelvo_compile INTERFACE -fsanitize=${KELVO_SANITIZE})
endif()
if(KELVO_FUZZ)
  target_compile_options(kelvo_compile INTERFACE -fsanitize=fuzzer-no-link)
endif()

# What every record passes through is worth more than CMake's -O2, a tenth of
# kelvo's time. Tests and tools are not.
if(NOT KELVO_SANITIZE)
  set(KELVO_OPTIMISE $<$<CONFIG:RelWithDebInfo>:-O3>)
endif()

# The command is linked with optimisation over its own libraries, which saves
# another tenth: many small functions of different folders work on every record.
# The tests link the ordinary code: that is quicker, and the functions that some of
# them replace stay functions.
if(KELVO_LTO AND CMAKE_CXX_COMPILER_ID STREQUAL GNU AND NOT KELVO_SANITIZE)
  include(CheckIPOSupported)
  check_ipo_supported(RESULT KELVO_IPO LANGUAGES CXX)
endif()

# Has the target, a part of the command or the command itself, take part in this.
function(kelvo_optimise_whole_program target)
  if(KELVO_IPO)
    set_target_properties(${target} PROPERTIES INTERPROCEDURAL_OPTIMIZATION_RELWITHDEBINFO ON
                                               INTERPROCEDURAL_OPTIMIZATION_RELEASE ON)
  endif()
endfunction()

# Links the target from the ordinary code.
function(kelvo_link_ordinary_code target)
  if(KELVO_IPO)
    target_link_options(${target} PRIVATE -fno-lto)
  endif()
endfunction()

# A static library of the sources of one folder; its folder is its include
# directory. Without sources it is an interface only.
#   kelvo_library(NAME [SOURCES file...] [LIBS library...])
function(kelvo_library name)
  cmake_parse_arguments(arg "" "" "SOURCES;LIBS" ${ARGN})
  if(arg_SOURCES)
    add_library(${name} STATIC ${arg_SOURCES})
    target_include_directories(${name} PUBLIC ${CMAKE_CURRENT_SOURCE_DIR})
    target_link_libraries(${name} PUBLIC ${arg_LIBS} PRIVATE kelvo_compile)
    target_compile_options(${name} PRIVATE ${KELVO_OPTIMISE})
    if(KELVO_PART_OF_COMMAND) # not what is installed: a library must link anywhere
      kelvo_optimise_whole_program(${name})
    endif()
  else()
    add_library(${name} INTERFACE)
    target_include_directories(${name} INTERFACE ${CMAKE_CURRENT_SOURCE_DIR})
    target_link_libraries(${name} INTERFACE ${arg_LIBS})
  endif()
endfunction()

# Half the time of a build goes into the tests. Under sanitizers they are not
# optimised, which would take three times as long; what they test is.
set(KELVO_TEST_OPTIONS)
if(KELVO_SANITIZE)
  set(KELVO_TEST_OPTIONS -O0)
endif()

# Has the target, a test, take GoogleTest's headers precompiled.
function(kelvo_precompile_gtest target)
  if(NOT TARGET gtest_headers) # compiled as a test is, else it could not be used
    set(source ${PROJECT_BINARY_DIR}/gtest_headers.cpp)
    file(CONFIGURE OUTPUT ${source} CONTENT "")
    add_library(gtest_headers OBJECT ${source})
    target_link_libraries(gtest_headers PRIVATE GTest::gmock GTest::gtest_main kelvo_compile)
    target_compile_options(gtest_headers PRIVATE ${KELVO_TEST_OPTIONS})
    target_precompile_headers(gtest_headers PRIVATE <gmock/gmock.h> <gtest/gtest.h>)
  endif()
  target_precompile_headers(${target} REUSE_FROM gtest_headers)
endfunction()

# A GoogleTest program whose cases are tests of their own.
#   kelvo_test(NAME SOURCES file... [LIBS library...])
function(kelvo_test name)
  cmake_parse_arguments(arg "" "" "SOURCES;LIBS" ${ARGN})
  add_executable(${name} ${arg_SOURCES})
  target_link_libraries(${name} PRIVATE ${arg_LIBS} GTest::gmock GTest::gtest_main kelvo_compile)
  kelvo_link_ordinary_code(${name})
  target_compile_options(${name} PRIVATE ${KELVO_TEST_OPTIONS})
  if(KELVO_PRECOMPILE)
    kelvo_precompile_gtest(${name})
  endif()
  gtest_discover_tests(${name} TEST_PREFIX "${name}." DISCOVERY_TIMEOUT 60
                       PROPERTIES TIMEOUT 300)
endfunction()

# A libFuzzer program; scripts/fuzz finds it by its name, which begins with
# fuzz_, and its seed inputs in fuzz/corpus/NAME.
#   kelvo_fuzz(NAME SOURCES file... [LIBS library...])
function(kelvo_fuzz name)
  cmake_parse_arguments(arg "" "" "SOURCES;LIBS" ${ARGN})
  add_executable(${name} ${arg_SOURCES})
  target_link_libraries(${name} PRIVATE ${arg_LIBS} kelvo_compile)
  target_link_options(${name} PRIVATE -fsanitize=fuzzer)
endfunction()
