# What `cmake --install` puts where: headers, libraries, pkg-config file, CMake package, command, manual pages, catalogue.
include(CMakePackageConfigHelpers)

install(FILES include/qn.h include/qn_cu.h include/qn_ffdc.h include/cu_tr_proxy.h include/qn_tr.h
        DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})

# Each finds the libraries beside it, or where they were installed, under any prefix and in a tree that was moved.
if(IS_ABSOLUTE "${CMAKE_INSTALL_LIBDIR}" OR IS_ABSOLUTE "${CMAKE_INSTALL_BINDIR}")
    set(libraries_of_command "${CMAKE_INSTALL_FULL_LIBDIR}")
else()
    file(RELATIVE_PATH libraries_of_command "/${CMAKE_INSTALL_BINDIR}" "/${CMAKE_INSTALL_LIBDIR}")
    string(PREPEND libraries_of_command "$ORIGIN/")
endif()
set_target_properties(qn_tr qn_cu qn_ffdc PROPERTIES INSTALL_RPATH "$ORIGIN")
set_target_properties(qntrace PROPERTIES INSTALL_RPATH "${libraries_of_command}")

install(TARGETS qn_tr qn_cu qn_ffdc EXPORT qn_tr_targets LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR})
install(TARGETS qntrace RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
install(DIRECTORY tools/qntrace/man/ DESTINATION ${CMAKE_INSTALL_MANDIR}/man1)
install(FILES docs/trace.conf.5 DESTINATION ${CMAKE_INSTALL_MANDIR}/man5)
install(FILES docs/trace.conf.sample DESTINATION ${CMAKE_INSTALL_DOCDIR}/examples)

# For the locales whose language the texts are in. With the prefix /usr this is where catopen() looks without NLSPATH; any
# other prefix needs PREFIX/share/locale/C/LC_MESSAGES/%N there.
foreach(locale C en)
    install(FILES ${QN_TR_CATALOGUE} DESTINATION ${CMAKE_INSTALL_DATADIR}/locale/${locale}/LC_MESSAGES)
endforeach()

include(cmake/pkg_config.cmake)
qn_pkg_config_file(${CMAKE_CURRENT_BINARY_DIR}/qn_tr.pc)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/qn_tr.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

set(package_dir ${CMAKE_INSTALL_LIBDIR}/cmake/qn_tr)
configure_package_config_file(cmake/qn_trConfig.cmake.in qn_trConfig.cmake INSTALL_DESTINATION ${package_dir})
write_basic_package_version_file(qn_trConfigVersion.cmake COMPATIBILITY SameMajorVersion)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/qn_trConfig.cmake ${CMAKE_CURRENT_BINARY_DIR}/qn_trConfigVersion.cmake
        DESTINATION ${package_dir})
install(EXPORT qn_tr_targets NAMESPACE qn_tr:: DESTINATION ${package_dir})
