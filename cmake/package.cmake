# The units, and the Debian packages (the target `package`, or `cpack`): ironmoat, which is the
# service and the tool; the library; its -dev. The preset `package` builds for where they install.

foreach(unit ironmoat@.socket ironmoat@.service)
  configure_file(${PROJECT_SOURCE_DIR}/packaging/systemd/${unit}.in
    ${PROJECT_BINARY_DIR}/${unit} @ONLY)
  # Not in LIBDIR, which may be one architecture's.
  install(FILES ${PROJECT_BINARY_DIR}/${unit} DESTINATION lib/systemd/system)
endforeach()

set(CPACK_GENERATOR DEB)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_PACKAGE_VENDOR "VeskIronmoatService maintainers")
set(CPACK_PACKAGE_CONTACT "VeskIronmoatService maintainers <maintainers@ironmoat.invalid>")
set(CPACK_PACKAGE_DIRECTORY ${PROJECT_BINARY_DIR}/packages)
set(CPACK_STRIP_FILES ON)
set(CPACK_INSTALL_DEFAULT_DIRECTORY_PERMISSIONS
  OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)
# What is compiled in has to be true.
set(CPACK_PACKAGING_INSTALL_PREFIX ${CMAKE_INSTALL_PREFIX})
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_VERSION ${PROJECT_VERSION})
set(CPACK_DEBIAN_PACKAGE_RELEASE 1)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(this_version ${CPACK_DEBIAN_PACKAGE_VERSION}-${CPACK_DEBIAN_PACKAGE_RELEASE})

# ironmoat_package(<component> <package> <section> <what> <what is in it> DEPENDS <package>...)
set(CPACK_COMPONENTS_ALL)
macro(ironmoat_package component name section what contents)
  cmake_parse_arguments(PACKAGE "" "" DEPENDS ${ARGN})
  string(TOUPPER ${component} key)
  list(APPEND CPACK_COMPONENTS_ALL ${component})
  set(CPACK_DEBIAN_${key}_PACKAGE_NAME ${name})
  set(CPACK_DEBIAN_${key}_PACKAGE_SECTION ${section})
  set(CPACK_DEBIAN_${key}_PACKAGE_DEPENDS ${PACKAGE_DEPENDS})
  set(CPACK_DEBIAN_${key}_DESCRIPTION "sandboxed unpacking of property-list messages (${what})
Turns messages from the network, property lists in binary or XML form, into
typed records, in a process of its own that can reach nothing but its own
connection.
.
${contents}")
  if(CMAKE_INSTALL_PREFIX STREQUAL /usr)
    install(FILES ${changelog} ${debian_changelog} ${PROJECT_SOURCE_DIR}/packaging/debian/copyright
      DESTINATION ${CMAKE_INSTALL_DATAROOTDIR}/doc/${name} COMPONENT ${component})
  endif()
endmacro()

if(CMAKE_INSTALL_PREFIX STREQUAL /usr)
  ironmoat_compressed(changelog ${PROJECT_SOURCE_DIR}/CHANGELOG.md changelog COPYONLY)
  ironmoat_compressed(debian_changelog ${PROJECT_SOURCE_DIR}/packaging/debian/changelog.in
    changelog.Debian @ONLY)
endif()

ironmoat_package(service ironmoat utils "service"
"This package has the service, socket units for it, and vesk-unpack, which
shows messages on a terminal.")
# How records are laid out between the two is theirs to change at any version.
ironmoat_package(library libironmoat${IRONMOAT_ABI} libs "client library"
  "This package has the library by which daemons start and ask the service."
  DEPENDS "ironmoat (= ${this_version})")
set(CPACK_DEBIAN_LIBRARY_PACKAGE_CONTROL_EXTRA ${PROJECT_SOURCE_DIR}/packaging/debian/triggers)
ironmoat_package(development libironmoat-dev libdevel "development"
  "This package has what is needed to compile daemons that ask the service."
  DEPENDS "libironmoat${IRONMOAT_ABI} (= ${this_version})")

include(CPack)
