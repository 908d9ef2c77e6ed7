# SPDX-License-Identifier: Apache-2.0
# Where things go. Outside the system's own folders a program finds the libraries beside it,
# wherever the whole is put; a library of the same name in LD_LIBRARY_PATH still comes first.
set(programs)
set(libraries)
foreach(name poolctl knobctl kestrelctl poolctl-install)
  if(TARGET ${name})
    list(APPEND programs ${name})
  endif()
endforeach()
foreach(name knob kestrelconfig kestrel_etcd)
  if(TARGET ${name})
    list(APPEND libraries ${name})
  endif()
endforeach()
# The build tree has the same shape and uses the same path: with two different ones CMake pads the
# first with an empty entry, which makes the loader look for libraries in the current folder.
if(NOT CMAKE_INSTALL_PREFIX STREQUAL "/usr")
  set_target_properties(${programs} PROPERTIES
    BUILD_WITH_INSTALL_RPATH ON INSTALL_RPATH "$ORIGIN/../lib;${yaml_cpp_rpath}")
  set(CMAKE_INSTALL_LIBDIR lib)
endif()
install(TARGETS ${programs}
        RUNTIME DESTINATION ${CMAKE_INSTALL_SBINDIR} COMPONENT programs)
install(TARGETS ${libraries}
        LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT programs NAMELINK_SKIP)
file(GLOB manual_pages CONFIGURE_DEPENDS ${CMAKE_SOURCE_DIR}/docs/man/*.[1-8])
foreach(page ${manual_pages})
  string(REGEX MATCH "[1-8]$" section ${page})
  install(FILES ${page} DESTINATION ${CMAKE_INSTALL_MANDIR}/man${section} COMPONENT programs)
endforeach()
install(DIRECTORY ${CMAKE_SOURCE_DIR}/examples
        DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/poolctl COMPONENT programs)
install(FILES ${CMAKE_SOURCE_DIR}/README.md ${CMAKE_SOURCE_DIR}/CHANGELOG.md
        DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/poolctl COMPONENT programs)
install(FILES ${CMAKE_SOURCE_DIR}/docs/fleet.md
        DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/poolctl/docs COMPONENT programs)

# Only a package writes to /etc, where its manager looks after changes of the owner's.
install(FILES ${CMAKE_SOURCE_DIR}/packaging/knob.conf
        DESTINATION ${CMAKE_INSTALL_FULL_SYSCONFDIR} COMPONENT configuration EXCLUDE_FROM_ALL)
install(DIRECTORY DESTINATION ${CMAKE_INSTALL_FULL_SYSCONFDIR}/rp.d
        DIRECTORY_PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE
                              WORLD_READ WORLD_EXECUTE
        COMPONENT configuration EXCLUDE_FROM_ALL)
include(cmake/package.cmake)
