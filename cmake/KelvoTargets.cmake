# How every target of the project is compiled, said once.

add_library(kelvo_compile INTERFACE)
target_compile_options(kelvo_compile INTERFACE
  -Wall -Wextra -Wpedantic -Wconversion -Wshadow
  $<$<BOOL:${KELVO_WERROR}>:-Werror>)
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
  else()
    add_library(${name} INTERFACE)
    target_include_directories(${name} INTERFACE ${CMAKE_CURRENT_SOURCE_DIR})
    target_link_libraries(${name} INTERFACE ${arg_LIBS})
  endif()
endfunction()

# A GoogleTest program whose cases are tests of their own.
#   kelvo_test(NAME SOURCES file... [LIBS library...])
function(kelvo_test name)
  cmake_parse_arguments(arg "" "" "SOURCES;LIBS" ${ARGN})
  add_executable(${name} ${arg_SOURCES})
  target_link_libraries(${name} PRIVATE ${arg_LIBS} GTest::gmock GTest::gtest_main kelvo_compile)
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
