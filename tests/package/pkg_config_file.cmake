# Makes the pkg-config file FILE for the folders that are given.
set(PROJECT_VERSION 1)
include(${CMAKE_CURRENT_LIST_DIR}/../../cmake/pkg_config.cmake)
qn_pkg_config_file(${FILE})
