# SPDX-License-Identifier: Apache-2.0
# Where things go. Outside the system's own folders a program finds the libraries in ../lib of its
# own folder, wherever the whole is put; a library of the same name in LD_LIBRARY_PATH still comes
# first.

# Sets OUT to the targets of TYPE that DIRECTORY and the folders below it define.
function(collect_targets out type directory)
  get_property(targets DIRECTORY ${directory} PROPERTY BUILDSYSTEM_TARGETS)
  set(found)
  foreach(target ${targets})
    get_target_property(target_type ${target} TYPE)
    if(target_type STREQUAL type)
      list(APPEND found ${target})
    endif()
  endforeach()
  get_property(folders DIRECTORY ${directory} PROPERTY SUBDIRECTORIES)
  foreach(folder ${folders})
    collect_targets(below ${type} ${folder})
    list(APPEND found ${below})
  endforeach()
  set(${out} ${found} PARENT_SCOPE)
endfunction()

collect_targets(programs EXECUTABLE ${CMAKE_SOURCE_DIR}/src)
collect_targets(tools EXECUTABLE ${CMAKE_SOURCE_DIR}/tools)
collect_targets(libraries SHARED_LIBRARY ${CMAKE_SOURCE_DIR}/platform)
list(APPEND programs ${tools})

# The build tree has the same shape and uses the same path: with two different ones CMake pads the
# first with an empty entry, which makes the loader look for libraries in the current folder.
if(CMAKE_INSTALL_PREFIX STREQUAL "/usr")
  set_target_properties(${programs} PROPERTIES INSTALL_RPATH "")
else()
  set_target_properties(${programs} PROPERTIES
    BUILD_WITH_INSTALL_RPATH ON INSTALL_RPATH "$ORIGIN/../lib;${yaml_cpp_rpath}")
  set(CMAKE_INSTALL_LIBDIR lib)
endif()

# Any user may run a command in a pool that is open to them; the others administer the host.
set(user_programs poolctl-exec)
list(REMOVE_ITEM programs ${user_programs})
install(TARGETS ${programs}
        RUNTIME DESTINATION ${CMAKE_INSTALL_SBINDIR} COMPONENT programs)
install(TARGETS ${user_programs}
        RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT programs)
# The module of the etcd store is a package of its own.
set(modules kestrel_etcd)
set(installed_libraries ${libraries})
list(REMOVE_ITEM installed_libraries ${modules})
install(TARGETS ${installed_libraries}
        LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT programs NAMELINK_SKIP)
install(TARGETS ${modules}
        LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT etcd NAMELINK_SKIP)
file(GLOB manual_pages CONFIGURE_DEPENDS ${CMAKE_SOURCE_DIR}/docs/man/*.[1-8])
foreach(page ${manual_pages})
  string(REGEX MATCH "[1-8]$" section ${page})
  install(FILES ${page} DESTINATION ${CMAKE_INSTALL_MANDIR}/man${section} COMPONENT programs)
endforeach()
install(DIRECTORY ${CMAKE_SOURCE_DIR}/examples
        DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/poolctl COMPONENT programs)
install(FILES ${CMAKE_SOURCE_DIR}/README.md ${CMAKE_SOURCE_DIR}/CHANGELOG.md
        DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/poolctl COMPONENT programs)
install(FILES ${CMAKE_SOURCE_DIR}/docs/fleet.md ${CMAKE_SOURCE_DIR}/docs/poolctl-plan.schema.json
        DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/poolctl/docs COMPONENT programs)

# Only a package installs files in /etc, since a package manager keeps the owner's changes there.
install(FILES ${CMAKE_SOURCE_DIR}/packaging/knob.conf
        DESTINATION ${CMAKE_INSTALL_FULL_SYSCONFDIR} COMPONENT configuration EXCLUDE_FROM_ALL)
install(DIRECTORY DESTINATION ${CMAKE_INSTALL_FULL_SYSCONFDIR}/rp.d
        DIRECTORY_PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE
                              WORLD_READ WORLD_EXECUTE
        COMPONENT configuration EXCLUDE_FROM_ALL)
include(cmake/package.cmake)
