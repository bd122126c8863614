# qn_pkg_config_file(file): what pkg-config is told of the installed library.
#
# The prefix is named from where the file lies, so that an installed tree may be moved; folders that were given as absolute
# paths are named as they are.
function(qn_pkg_config_file file)
    foreach(dir LIBDIR INCLUDEDIR)
        set(QN_TR_PC_${dir} "\${prefix}/${CMAKE_INSTALL_${dir}}")
        if(IS_ABSOLUTE "${CMAKE_INSTALL_${dir}}")
            set(QN_TR_PC_${dir} "${CMAKE_INSTALL_${dir}}")
        endif()
    endforeach()
    if(IS_ABSOLUTE "${CMAKE_INSTALL_LIBDIR}")
        set(QN_TR_PC_PREFIX "${CMAKE_INSTALL_PREFIX}")
    else()
        file(RELATIVE_PATH to_prefix "/${CMAKE_INSTALL_LIBDIR}/pkgconfig" "/")
        set(QN_TR_PC_PREFIX "\${pcfiledir}/${to_prefix}")
    endif()
    configure_file(${CMAKE_CURRENT_FUNCTION_LIST_DIR}/qn_tr.pc.in ${file} @ONLY)
endfunction()
