# SPDX-License-Identifier: Apache-2.0
# The Debian package ("make package"): one for everything, configured with the prefix /usr.
set(CPACK_GENERATOR DEB)
set(CPACK_SET_DESTDIR ON)
set(CPACK_PACKAGE_NAME poolctl)
set(CPACK_PACKAGE_CONTACT "poolctl maintainers <poolctl@localhost>")
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "resource pools of a hypervisor host")
set(CPACK_PACKAGE_DESCRIPTION
    "poolctl reserves and limits memory and CPU for the services of a host. Pools are declared in
YAML files, whose values may be expressions over the facts of the host or references to its
configuration store.")
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SECTION admin)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
# Loaded by name at run time, so dpkg-shlibdeps does not find it in the programs.
set(CPACK_DEBIAN_PACKAGE_DEPENDS libsqlite3-0)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_PACKAGE_CONTROL_EXTRA ${CMAKE_SOURCE_DIR}/packaging/conffiles)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(CPACK_STRIP_FILES ON)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_COMPONENTS_ALL programs configuration)
set(CPACK_COMPONENTS_GROUPING ALL_COMPONENTS_IN_ONE)
include(CPack)
