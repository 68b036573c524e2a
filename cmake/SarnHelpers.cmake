# Shared build settings and the helpers that add tests, fuzzers and benchmarks.
include_guard(GLOBAL)

# Warnings are private to our own targets: they link this interface target PRIVATE,
# so nothing of it reaches a consumer of sarn::sarn.
if(NOT TARGET sarn_warnings)
  add_library(sarn_warnings INTERFACE)
  target_compile_options(sarn_warnings INTERFACE
    -Wall -Wextra -Werror -Wno-unused-parameter -Wno-missing-field-initializers)
endif()

# Sanitizers apply to every target of the tree (libraries, tests, tools) so that
# the instrumented code and the runtime match.
if(SARN_SANITIZE)
  add_compile_options(-fsanitize=address,undefined -fno-omit-frame-pointer -fno-sanitize-recover=undefined)
  add_link_options(-fsanitize=address,undefined)
endif()
if(SARN_SANITIZE_THREAD)
  if(SARN_SANITIZE)
    message(FATAL_ERROR "SARN_SANITIZE and SARN_SANITIZE_THREAD exclude each other")
  endif()
  add_compile_options(-fsanitize=thread -fno-omit-frame-pointer)
  add_link_options(-fsanitize=thread)
endif()

# A fuzzing build instruments all of our code for coverage, so that the fuzzers see inside the
# libraries and not only their own file (the libFuzzer runtime comes with the fuzz targets).
if(SARN_BUILD_FUZZERS AND CMAKE_CXX_COMPILER_ID MATCHES "Clang")
  add_compile_options(-fsanitize=fuzzer-no-link)
endif()

# Test executables link against this (gtest, the library, shared test helpers).
function(sarn_add_test source)
  get_filename_component(_name ${source} NAME_WE)
  add_executable(${_name} ${source})
  target_link_libraries(${_name} PRIVATE sarn_testutil GTest::gtest GTest::gtest_main sarn_warnings ${ARGN})
  add_test(NAME ${_name} COMMAND ${_name})
  set_tests_properties(${_name} PROPERTIES
    ENVIRONMENT "SARN_SOURCE_DIR=${PROJECT_SOURCE_DIR};SARN_CORPORA_DIR=${PROJECT_SOURCE_DIR}/../shared/corpora")
endfunction()

# A fuzz target <stem>_fuzz.cpp defines LLVMFuzzerTestOneInput. It is always built with a
# replay main that runs its seed corpus (fuzz/corpus/<stem>) as an ordinary test; with
# SARN_BUILD_FUZZERS and clang it is also built as a libFuzzer binary.
function(sarn_add_fuzzer source)
  get_filename_component(_stem ${source} NAME_WE)
  set(_corpus ${PROJECT_SOURCE_DIR}/fuzz/corpus/${_stem})
  if(SARN_BUILD_TESTS)
    add_executable(${_stem}_replay ${source} ${PROJECT_SOURCE_DIR}/fuzz/ReplayMain.cpp)
    target_link_libraries(${_stem}_replay PRIVATE sarn::sarn sarn_warnings ${ARGN})
    add_test(NAME ${_stem}_replay COMMAND ${_stem}_replay ${_corpus})
  endif()
  if(SARN_BUILD_FUZZERS AND CMAKE_CXX_COMPILER_ID MATCHES "Clang")
    add_executable(${_stem} ${source})
    target_compile_options(${_stem} PRIVATE -fsanitize=fuzzer)
    target_link_options(${_stem} PRIVATE -fsanitize=fuzzer)
    target_link_libraries(${_stem} PRIVATE sarn::sarn ${ARGN})
  endif()
endfunction()

function(sarn_add_benchmark source)
  get_filename_component(_name ${source} NAME_WE)
  add_executable(${_name} ${source})
  target_link_libraries(${_name} PRIVATE sarn::sarn sarn_benchanchors benchmark::benchmark ${ARGN})
endfunction()

# A proto2 mirror of the listed schema types (comma-separated), compiled with protoc into a static
# library `target` (C++ namespace sarnmirror), for tests and benchmarks that compare the binary
# form with a protocol-buffer library.
function(sarn_add_proto_mirror target types)
  find_program(SARN_PROTOC protoc REQUIRED)
  find_package(PkgConfig REQUIRED)
  pkg_check_modules(SARN_MIRROR_PROTOBUF REQUIRED IMPORTED_TARGET protobuf)
  set(_dir ${CMAKE_CURRENT_BINARY_DIR}/${target})
  add_custom_command(
    OUTPUT ${_dir}/mirror.pb.cc ${_dir}/mirror.pb.h
    COMMAND ${CMAKE_COMMAND} -E make_directory ${_dir}
    COMMAND sh -c "\"$1\" \"$2\" --proto \"$3\" > \"$4\"" sh $<TARGET_FILE:schemagen> ${SARN_SCHEMA_FILE} ${types}
            ${_dir}/mirror.proto
    COMMAND ${SARN_PROTOC} --cpp_out=${_dir} -I${_dir} ${_dir}/mirror.proto
    DEPENDS schemagen ${SARN_SCHEMA_FILE}
    COMMENT "Generating the protocol-buffer mirror ${target}"
    VERBATIM)
  add_library(${target} STATIC ${_dir}/mirror.pb.cc)
  target_include_directories(${target} SYSTEM PUBLIC ${_dir})
  target_link_libraries(${target} PUBLIC PkgConfig::SARN_MIRROR_PROTOBUF)
endfunction()
