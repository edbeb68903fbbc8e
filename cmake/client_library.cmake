# The client library as it is installed: all that the module `client` reaches in one archive and in
# one shared library, both from the modules' own objects. To CMake they are Ironmoat::client_static
# and Ironmoat::client, for who installs them and for who adds this folder to his build.

# Before 1.0 any minor version may change what daemons are compiled against.
set(IRONMOAT_ABI ${PROJECT_VERSION_MAJOR})
if(PROJECT_VERSION_MAJOR EQUAL 0)
  set(IRONMOAT_ABI 0.${PROJECT_VERSION_MINOR})
endif()
file(STRINGS ${PROJECT_SOURCE_DIR}/include/ironmoat/api.h said REGEX "^#define IRONMOAT_ABI ")
string(REPLACE . _ wanted "#define IRONMOAT_ABI ${IRONMOAT_ABI}")
if(NOT said STREQUAL wanted)
  message(FATAL_ERROR "for version ${PROJECT_VERSION} include/ironmoat/api.h must say '${wanted}'")
endif()
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS
  ${PROJECT_SOURCE_DIR}/include/ironmoat/api.h)

ironmoat_link_closure(ironmoat_client reached)
set(objects)
foreach(target ${reached})
  get_target_property(type ${target} TYPE)
  if(type STREQUAL STATIC_LIBRARY)
    list(APPEND objects $<TARGET_OBJECTS:${target}>)
  endif()
endforeach()

foreach(kind SHARED STATIC)
  string(TOLOWER ironmoat_${kind} library)
  add_library(${library} ${kind} ${objects})
  target_link_libraries(${library} PUBLIC Threads::Threads)
  target_compile_features(${library} INTERFACE cxx_std_20)
  target_include_directories(${library} INTERFACE
    $<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}/include> $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}>)
  set_target_properties(${library} PROPERTIES LINKER_LANGUAGE CXX OUTPUT_NAME ironmoat)
endforeach()
set_target_properties(ironmoat_static PROPERTIES EXPORT_NAME client_static)
set_target_properties(ironmoat_shared PROPERTIES
  EXPORT_NAME client
  VERSION ${PROJECT_VERSION}
  SOVERSION ${IRONMOAT_ABI}
  LINK_DEPENDS ${CMAKE_CURRENT_LIST_DIR}/exports.map)
target_link_options(ironmoat_shared PRIVATE
  LINKER:--version-script=${CMAKE_CURRENT_LIST_DIR}/exports.map)
if(NOT IRONMOAT_SANITIZE)
  target_link_options(ironmoat_shared PRIVATE LINKER:--no-undefined)
endif()
add_library(Ironmoat::client ALIAS ironmoat_shared)
add_library(Ironmoat::client_static ALIAS ironmoat_static)

if(IRONMOAT_TESTS AND NOT IRONMOAT_SANITIZE)
  add_test(NAME client_library/Symbols
    COMMAND ${PROJECT_SOURCE_DIR}/packaging/check-symbols $<TARGET_FILE:ironmoat_shared>)
endif()

if(NOT IRONMOAT_INSTALL)
  add_dependencies(ironmoat_shared VeskIronmoatService)  # they start it where it was built
  add_dependencies(ironmoat_static VeskIronmoatService)
  return()
endif()
install(TARGETS ironmoat_shared EXPORT ironmoat
  LIBRARY COMPONENT library NAMELINK_COMPONENT development)
install(TARGETS ironmoat_static EXPORT ironmoat ARCHIVE COMPONENT development)
install(DIRECTORY ${PROJECT_SOURCE_DIR}/include/ironmoat TYPE INCLUDE COMPONENT development
  FILES_MATCHING PATTERN "*.h")

# find_package(Ironmoat)
include(CMakePackageConfigHelpers)
set(config_folder ${CMAKE_INSTALL_LIBDIR}/cmake/Ironmoat)
set(service ${CMAKE_INSTALL_LIBEXECDIR}/VeskIronmoatService)
set(fake_service ${CMAKE_INSTALL_LIBEXECDIR}/ironmoat-fake-service)
configure_package_config_file(${CMAKE_CURRENT_LIST_DIR}/IronmoatConfig.cmake.in
  ${PROJECT_BINARY_DIR}/IronmoatConfig.cmake
  INSTALL_DESTINATION ${config_folder} PATH_VARS service fake_service)
write_basic_package_version_file(${PROJECT_BINARY_DIR}/IronmoatConfigVersion.cmake
  COMPATIBILITY SameMinorVersion)
install(FILES ${PROJECT_BINARY_DIR}/IronmoatConfig.cmake
  ${PROJECT_BINARY_DIR}/IronmoatConfigVersion.cmake
  DESTINATION ${config_folder} COMPONENT development)
install(EXPORT ironmoat NAMESPACE Ironmoat:: FILE IronmoatTargets.cmake
  DESTINATION ${config_folder} COMPONENT development)

# pkg-config ironmoat: its prefix is the one that is installed to, which only the installation knows.
foreach(folder LIBDIR INCLUDEDIR LIBEXECDIR)
  file(RELATIVE_PATH ${folder}_from_prefix ${CMAKE_INSTALL_PREFIX} ${CMAKE_INSTALL_FULL_${folder}})
endforeach()
set(at @)
configure_file(${CMAKE_CURRENT_LIST_DIR}/ironmoat.pc.in ${PROJECT_BINARY_DIR}/ironmoat.pc.in @ONLY)
install(CODE "
  set(prefix \"\${CMAKE_INSTALL_PREFIX}\")
  configure_file(\"${PROJECT_BINARY_DIR}/ironmoat.pc.in\" \"${PROJECT_BINARY_DIR}/ironmoat.pc\" @ONLY)"
  COMPONENT development)
install(FILES ${PROJECT_BINARY_DIR}/ironmoat.pc
  DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig COMPONENT development)
