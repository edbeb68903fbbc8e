# A module is a folder below src/ and one static library `ironmoat_<module>`.
#
#   ironmoat_module(<module> SOURCES file... [LINKS module...] [LIBRARIES target...] [TESTS file...])
#
# LINKS are the modules whose headers it may include, and with them those that they link. A module sees
# only their folders, so an include against the arrows does not compile. TESTS (x_test.cc beside x.cc) become one
# program <module>_test.

set(IRONMOAT_MODULES_DIR ${CMAKE_BINARY_DIR}/modules)

add_library(ironmoat_headers INTERFACE)
target_include_directories(ironmoat_headers INTERFACE ${PROJECT_SOURCE_DIR}/include)

target_compile_features(ironmoat_headers INTERFACE cxx_std_20)

# Makes src/<module> includable as "<module>/..." by whoever links `target`.
function(ironmoat_expose_module target scope module)
  file(MAKE_DIRECTORY ${IRONMOAT_MODULES_DIR}/${module})
  file(CREATE_LINK ${PROJECT_SOURCE_DIR}/src/${module} ${IRONMOAT_MODULES_DIR}/${module}/${module} SYMBOLIC)
  target_include_directories(${target} ${scope} ${IRONMOAT_MODULES_DIR}/${module})
endfunction()

function(ironmoat_module module)
  cmake_parse_arguments(MODULE "" "" "SOURCES;LINKS;LIBRARIES;TESTS" ${ARGN})
  add_library(ironmoat_${module} STATIC ${MODULE_SOURCES})
  ironmoat_expose_module(ironmoat_${module} PUBLIC ${module})
  list(TRANSFORM MODULE_LINKS PREPEND ironmoat_)
  target_link_libraries(ironmoat_${module} PUBLIC ironmoat_headers ${MODULE_LINKS} ${MODULE_LIBRARIES})
  if(MODULE_TESTS)
    ironmoat_test(${module}_test SOURCES ${MODULE_TESTS} LINKS ${module})
  endif()
endfunction()

# A GoogleTest program, each of whose cases is a CTest test.
function(ironmoat_test name)
  if(NOT IRONMOAT_TESTS)
    return()
  endif()
  cmake_parse_arguments(TEST "" "" "SOURCES;LINKS;LIBRARIES" ${ARGN})
  add_executable(${name} ${TEST_SOURCES})
  set_target_properties(${name} PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/tests)
  list(TRANSFORM TEST_LINKS PREPEND ironmoat_)
  target_include_directories(${name} PRIVATE
    ${PROJECT_SOURCE_DIR}/tests ${PROJECT_SOURCE_DIR}/fuzz)
  target_link_libraries(${name} PRIVATE ${TEST_LINKS} ${TEST_LIBRARIES} GTest::gtest_main)
  gtest_discover_tests(${name} TEST_PREFIX ${name}/ DISCOVERY_TIMEOUT 60 PROPERTIES TIMEOUT 300)
endfunction()
