# SPDX-License-Identifier: Apache-2.0
# Build rules shared by every folder: one place for the language level, the warnings and the sanitizers.
include_guard(GLOBAL)

option(TARN_TESTS "Build the tests" ON)
option(TARN_BENCH "Build the benchmarks" OFF)
option(TARN_FUZZ "Build the fuzzers (clang only)" OFF)
option(TARN_COVERAGE "Instrument for line and branch coverage (clang only)" OFF)
option(TARN_WERROR "Warnings are errors; for who changes the code, not for who builds it with another compiler" OFF)
option(TARN_HARDENING "Harden what is built; never with a sanitizer or instrumentation, which do it their own way" ON)
set(TARN_SANITIZE "" CACHE STRING "Sanitizers to build with, as -fsanitize= takes them")

if(NOT CMAKE_BUILD_TYPE AND NOT CMAKE_CONFIGURATION_TYPES)
  set(CMAKE_BUILD_TYPE RelWithDebInfo CACHE STRING "How to build when nothing is said" FORCE)
endif()

set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)
set(CMAKE_EXPORT_COMPILE_COMMANDS ON)
set(CMAKE_RUNTIME_OUTPUT_DIRECTORY "${PROJECT_BINARY_DIR}/bin")

find_program(TARN_CCACHE ccache)
if(TARN_CCACHE)
  set(CMAKE_CXX_COMPILER_LAUNCHER "${TARN_CCACHE}")
endif()
find_package(Threads REQUIRED)

# For everything from here on, in front of a target's own options, so that a target can take one back.
if(TARN_HARDENING AND NOT (TARN_SANITIZE OR TARN_COVERAGE OR TARN_FUZZ))
  # In the flags, since what becomes part of a shared library adds its own -fPIC after these.
  string(APPEND CMAKE_CXX_FLAGS " -fPIE")
  string(APPEND CMAKE_EXE_LINKER_FLAGS " -pie")
  add_compile_options(-fstack-protector-strong -fstack-clash-protection)
  add_link_options(-Wl,-z,relro,-z,now)
  if(NOT CMAKE_BUILD_TYPE STREQUAL "Debug")
    # Not without optimisation. What a packager's own flags ask for gives way.
    add_compile_options(-U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=3)
  endif()
endif()
# By which a program, its debug symbols and a crash's memory are matched; the same for the same code.
add_link_options(-Wl,--build-id=sha1)
# Nobody's folders in what is built: it is the same wherever the source lies. As seen from the build's folder, so that
# it is also the same with a compiler's cache, which asks for files by such names.
add_compile_options("-ffile-prefix-map=${PROJECT_SOURCE_DIR}=..")
# The same for what is made of sources that lie in the build's folder, which a cache names by less still.
set(TARN_MADE_SOURCES_OPTION "-ffile-prefix-map=${PROJECT_BINARY_DIR}/=")
# Programs find the tree's libraries from where they stand themselves. An installation takes that out again, but the
# table keeps the place, whose size would be that of a folder's name.
set(CMAKE_BUILD_RPATH_USE_ORIGIN ON)

add_library(tarn_options INTERFACE)
target_include_directories(tarn_options INTERFACE "${PROJECT_SOURCE_DIR}")
target_link_libraries(tarn_options INTERFACE Threads::Threads)
target_compile_options(tarn_options INTERFACE
  -Wall -Wextra -Wpedantic -Wshadow -Wconversion -Wsign-conversion -Wold-style-cast -Wnon-virtual-dtor
  -Woverloaded-virtual -Wcast-align -Wunused -Wdouble-promotion -Wformat=2 -Wimplicit-fallthrough
  -fno-omit-frame-pointer)
if(TARN_WERROR)
  target_compile_options(tarn_options INTERFACE -Werror)
endif()
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  target_compile_options(tarn_options INTERFACE -Wduplicated-cond -Wlogical-op)
endif()
if(TARN_SANITIZE)
  target_compile_options(tarn_options INTERFACE -fsanitize=${TARN_SANITIZE} -fno-sanitize-recover=all)
  target_link_options(tarn_options INTERFACE -fsanitize=${TARN_SANITIZE})
  if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
    # The sanitizers' own instrumentation upsets the flow analysis behind this one.
    target_compile_options(tarn_options INTERFACE -Wno-maybe-uninitialized)
  endif()
endif()
if(TARN_FUZZ)
  # The fuzzers steer by which branches of all the code are reached.
  target_compile_options(tarn_options INTERFACE -fsanitize=fuzzer-no-link)
endif()
if(TARN_COVERAGE)
  # By the source, not by the compiled code: no branch is counted for what an exception might do.
  target_compile_options(tarn_options INTERFACE -fprofile-instr-generate -fcoverage-mapping -fprofile-update=atomic)
  target_link_options(tarn_options INTERFACE -fprofile-instr-generate)
endif()

# tarn_library(NAME SOURCES file... [DEPENDS target...]): one floor or folder as a static library.
function(tarn_library name)
  cmake_parse_arguments(PARSE_ARGV 1 arg "" "" "SOURCES;DEPENDS")
  if(arg_SOURCES)
    add_library(${name} STATIC ${arg_SOURCES})
    target_link_libraries(${name} PUBLIC tarn_options ${arg_DEPENDS})
  else()
    add_library(${name} INTERFACE)
    target_link_libraries(${name} INTERFACE tarn_options ${arg_DEPENDS})
  endif()
endfunction()

# tarn_program(NAME SOURCES file... [DEPENDS target...]): a program in build/<preset>/bin.
function(tarn_program name)
  cmake_parse_arguments(PARSE_ARGV 1 arg "" "" "SOURCES;DEPENDS")
  add_executable(${name} ${arg_SOURCES})
  target_link_libraries(${name} PRIVATE tarn_options ${arg_DEPENDS})
endfunction()

# tarn_test(NAME SOURCES file... [DEPENDS target...] [TIMEOUT seconds]): a GoogleTest program, each test known to ctest.
function(tarn_test name)
  cmake_parse_arguments(PARSE_ARGV 1 arg "" "TIMEOUT" "SOURCES;DEPENDS")
  find_package(GTest REQUIRED)
  include(GoogleTest)
  if(NOT arg_TIMEOUT)
    set(arg_TIMEOUT 120)
  endif()
  add_executable(${name} ${arg_SOURCES})
  set_target_properties(${name} PROPERTIES RUNTIME_OUTPUT_DIRECTORY "${PROJECT_BINARY_DIR}/tests")
  target_link_libraries(${name} PRIVATE tarn_options ${arg_DEPENDS} GTest::gtest GTest::gtest_main)
  if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND NOT TARN_SANITIZE)
    # Half of a test's compile time is optimisation, which nobody needs: what it calls is optimised in the libraries.
    target_compile_options(${name} PRIVATE -O0 -U_FORTIFY_SOURCE)
  endif()
  gtest_discover_tests(${name} DISCOVERY_MODE PRE_TEST DISCOVERY_TIMEOUT 60 PROPERTIES TIMEOUT ${arg_TIMEOUT})
endfunction()

# tarn_short_memory_tests(PROGRAM file...): tests of that program whose allocations fail when they say so. Not under a
# sanitizer, which has an allocator of its own.
function(tarn_short_memory_tests program)
  if(NOT TARN_SANITIZE)
    target_sources(${program} PRIVATE ${ARGN} "${PROJECT_SOURCE_DIR}/tests/support/FailingAllocations.cpp")
  endif()
endfunction()

# tarn_fuzzer(NAME SOURCES file... [DEPENDS target...]): a fuzzer, whose sources define LLVMFuzzerTestOneInput. With
# TARN_FUZZ it is a libFuzzer program; with TARN_TESTS a test replays its seeds, which lie in fuzz/corpus/NAME.
function(tarn_fuzzer name)
  cmake_parse_arguments(PARSE_ARGV 1 arg "" "" "SOURCES;DEPENDS")
  if(TARN_FUZZ)
    tarn_program(${name} SOURCES ${arg_SOURCES} DEPENDS ${arg_DEPENDS})
    target_link_options(${name} PRIVATE -fsanitize=fuzzer)
  endif()
  if(TARN_TESTS)
    add_executable(${name}Replay ${arg_SOURCES} "${PROJECT_SOURCE_DIR}/tests/fuzz/ReplayMain.cpp")
    set_target_properties(${name}Replay PROPERTIES RUNTIME_OUTPUT_DIRECTORY "${PROJECT_BINARY_DIR}/tests")
    target_link_libraries(${name}Replay PRIVATE tarn_options ${arg_DEPENDS})
    add_test(NAME ${name}.ReplaysItsSeeds COMMAND ${name}Replay "${PROJECT_SOURCE_DIR}/fuzz/corpus/${name}")
    set_tests_properties(${name}.ReplaysItsSeeds PROPERTIES TIMEOUT 120)
  endif()
endfunction()
