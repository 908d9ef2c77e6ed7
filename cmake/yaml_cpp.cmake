# SPDX-License-Identifier: Apache-2.0
# The library's own package names its target differently from version to version:
# 0.8 exports yaml-cpp::yaml-cpp, 0.7 yaml-cpp, and Debian's 0.6 only variables.
find_package(yaml-cpp REQUIRED)
add_library(yaml_cpp INTERFACE)
if(TARGET yaml-cpp::yaml-cpp)
  target_link_libraries(yaml_cpp INTERFACE yaml-cpp::yaml-cpp)
elseif(TARGET yaml-cpp)
  target_link_libraries(yaml_cpp INTERFACE yaml-cpp)
else()
  target_include_directories(yaml_cpp SYSTEM INTERFACE ${YAML_CPP_INCLUDE_DIR})
  target_link_libraries(yaml_cpp INTERFACE ${YAML_CPP_LIBRARIES})
endif()

# A copy outside the system's folders must be found at run time too. Its CMake package is in
# LIBRARIES/cmake/yaml-cpp, so the libraries are two folders up.
set(yaml_cpp_rpath)
if(NOT yaml-cpp_DIR MATCHES "^/usr/")
  get_filename_component(yaml_cpp_rpath ${yaml-cpp_DIR}/../.. ABSOLUTE)
endif()
