# SPDX-License-Identifier: Apache-2.0
# The Debian packages ("make package"), built with the prefix /usr: "poolctl", and apart from it
# "kestrelconfig-etcd", the module for a store in etcd, so that only hosts which use it need libcurl.
set(CPACK_GENERATOR DEB)
set(CPACK_SET_DESTDIR ON)
set(CPACK_PACKAGE_NAME poolctl)
set(CPACK_PACKAGE_CONTACT "poolctl maintainers <poolctl@localhost>")
set(CPACK_STRIP_FILES ON)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_COMPONENTS_GROUPING ONE_PER_GROUP)
set(CPACK_COMPONENTS_ALL programs configuration etcd)
set(CPACK_COMPONENT_PROGRAMS_GROUP poolctl)
set(CPACK_COMPONENT_CONFIGURATION_GROUP poolctl)
set(CPACK_COMPONENT_ETCD_GROUP etcd)

set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_RELEASE 1)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)

set(CPACK_DEBIAN_POOLCTL_PACKAGE_NAME poolctl)
set(CPACK_DEBIAN_POOLCTL_PACKAGE_SECTION admin)
set(CPACK_COMPONENT_POOLCTL_DESCRIPTION
    "resource pools of a hypervisor host
poolctl reserves and limits memory and CPU for the services of a host.
Pools are declared in YAML files, whose values may be expressions over
the facts of the host or references to its configuration store.")
# Loaded by name at run time, so dpkg-shlibdeps does not find it in the programs.
set(CPACK_DEBIAN_POOLCTL_PACKAGE_DEPENDS libsqlite3-0)
set(CPACK_DEBIAN_POOLCTL_PACKAGE_SUGGESTS kestrelconfig-etcd)
set(CPACK_DEBIAN_POOLCTL_PACKAGE_CONTROL_EXTRA
    ${CMAKE_SOURCE_DIR}/packaging/conffiles ${CMAKE_SOURCE_DIR}/packaging/triggers)

set(CPACK_DEBIAN_ETCD_PACKAGE_NAME kestrelconfig-etcd)
set(CPACK_DEBIAN_ETCD_PACKAGE_SECTION admin)
set(CPACK_COMPONENT_ETCD_DESCRIPTION
    "configuration store of poolctl in an etcd cluster
This module lets poolctl read the values of a whole fleet of hosts from etcd.")
set(CPACK_DEBIAN_ETCD_PACKAGE_DEPENDS "poolctl (= ${PROJECT_VERSION}-1)")
set(CPACK_DEBIAN_ETCD_PACKAGE_CONTROL_EXTRA ${CMAKE_SOURCE_DIR}/packaging/triggers)
# The module replaced a file of the package that had both.
set(CPACK_DEBIAN_ETCD_PACKAGE_REPLACES "poolctl (<< ${PROJECT_VERSION}-1)")
set(CPACK_DEBIAN_ETCD_PACKAGE_BREAKS "poolctl (<< ${PROJECT_VERSION}-1)")
include(CPack)

# Files that only a package needs. gzip -n leaves out the time, which would differ between two builds.
if(CMAKE_INSTALL_PREFIX STREQUAL "/usr")
  foreach(package poolctl kestrelconfig-etcd)
    if(package STREQUAL poolctl)
      set(component programs)
    else()
      set(component etcd)
    endif()
    set(documents ${CMAKE_INSTALL_DATADIR}/doc/${package})
    install(FILES ${CMAKE_SOURCE_DIR}/packaging/copyright
            DESTINATION ${documents} COMPONENT ${component})
    install(FILES ${CMAKE_SOURCE_DIR}/packaging/changelog.Debian
            DESTINATION ${documents} COMPONENT ${component})
    install(CODE "execute_process(COMMAND gzip -9nf
        \"\$ENV{DESTDIR}${CMAKE_INSTALL_PREFIX}/${documents}/changelog.Debian\" COMMAND_ERROR_IS_FATAL ANY)"
      COMPONENT ${component})
  endforeach()
  install(CODE "
    file(GLOB_RECURSE pages \"\$ENV{DESTDIR}${CMAKE_INSTALL_PREFIX}/${CMAKE_INSTALL_MANDIR}/*.[1-8]\")
    execute_process(COMMAND gzip -9nf \${pages} COMMAND_ERROR_IS_FATAL ANY)"
    COMPONENT programs)
endif()
