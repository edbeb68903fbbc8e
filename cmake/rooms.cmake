# A room is a folder below src/ and one static library `ironmoat_<room>`.
#
#   ironmoat_room(<room> SOURCES file... [LINKS room...] [LIBRARIES target...] [TESTS file...])
#
# LINKS are the rooms whose headers it may include, and with them those that they link. A room sees
# only their folders, so an include against the arrows does not compile. TESTS (x_test.cc beside x.cc) become one
# program <room>_test.

set(IRONMOAT_ROOMS_DIR ${CMAKE_BINARY_DIR}/rooms)

add_library(ironmoat_headers INTERFACE)
target_include_directories(ironmoat_headers INTERFACE ${PROJECT_SOURCE_DIR}/include)

target_compile_features(ironmoat_headers INTERFACE cxx_std_20)

# Makes src/<room> includable as "<room>/..." by whoever links `target`.
function(ironmoat_expose_room target scope room)
  file(MAKE_DIRECTORY ${IRONMOAT_ROOMS_DIR}/${room})
  file(CREATE_LINK ${PROJECT_SOURCE_DIR}/src/${room} ${IRONMOAT_ROOMS_DIR}/${room}/${room} SYMBOLIC)
  target_include_directories(${target} ${scope} ${IRONMOAT_ROOMS_DIR}/${room})
endfunction()

function(ironmoat_room room)
  cmake_parse_arguments(ROOM "" "" "SOURCES;LINKS;LIBRARIES;TESTS" ${ARGN})
  add_library(ironmoat_${room} STATIC ${ROOM_SOURCES})
  ironmoat_expose_room(ironmoat_${room} PUBLIC ${room})
  list(TRANSFORM ROOM_LINKS PREPEND ironmoat_)
  target_link_libraries(ironmoat_${room} PUBLIC ironmoat_headers ${ROOM_LINKS} ${ROOM_LIBRARIES})
  if(ROOM_TESTS)
    ironmoat_test(${room}_test SOURCES ${ROOM_TESTS} LINKS ${room})
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
  target_include_directories(${name} PRIVATE ${PROJECT_SOURCE_DIR}/tests)
  target_link_libraries(${name} PRIVATE ${TEST_LINKS} ${TEST_LIBRARIES} GTest::gtest_main)
  gtest_discover_tests(${name} TEST_PREFIX ${name}/ DISCOVERY_TIMEOUT 60 PROPERTIES TIMEOUT 300)
endfunction()
