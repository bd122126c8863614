# Packages of the npm registry for a folder with a package.json and its lock file, installed into the build folder while
# CMake configures.
find_program(QN_TR_NPM npm)
mark_as_advanced(QN_TR_NPM)

# qn_npm_packages(folder result): the folder that holds node_modules, or nothing when npm or a package cannot be had.
function(qn_npm_packages folder result)
    set(${result} "" PARENT_SCOPE)
    if(NOT QN_TR_NPM)
        return()
    endif()
    file(RELATIVE_PATH name ${PROJECT_SOURCE_DIR} ${folder})
    set(installed ${PROJECT_BINARY_DIR}/npm/${name})
    set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${folder}/package-lock.json)
    file(SHA256 ${folder}/package-lock.json wanted)
    set(there "")
    if(EXISTS ${installed}/installed)
        file(READ ${installed}/installed there)
    endif()
    if(NOT there STREQUAL wanted)
        message(STATUS "Installing the npm packages of ${name}")
        file(COPY ${folder}/package.json ${folder}/package-lock.json ${folder}/.npmrc DESTINATION ${installed})
        execute_process(
            COMMAND ${QN_TR_NPM} ci --ignore-scripts
            WORKING_DIRECTORY ${installed}
            RESULT_VARIABLE failed
            OUTPUT_VARIABLE told
            ERROR_VARIABLE told)
        if(failed)
            message(WARNING "The npm packages of ${name} cannot be installed:\n${told}")
            return()
        endif()
        file(WRITE ${installed}/installed ${wanted})
    endif()
    set(${result} ${installed} PARENT_SCOPE)
endfunction()
