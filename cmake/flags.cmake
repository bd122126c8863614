# Compiler and linker flags that hold for every target.
add_compile_options(-Wall -Wextra -Wno-missing-field-initializers -Wformat=2 -Werror=format-security -fstack-protector-strong)
if(QN_TR_WERROR)
    add_compile_options(-Werror)
endif()

if(QN_TR_CHECK_LOCK_ORDER)
    add_compile_definitions(QN_TR_CHECK_LOCK_ORDER)
endif()

# A thread cancelled inside the library unwinds like an exception: every frame, C ones too, needs its unwind table.
add_compile_options(-fexceptions -fasynchronous-unwind-tables)

# An exported function may be replaced by the application; calls to it are never inlined or bound early.
add_compile_options(-fsemantic-interposition)

add_link_options(-Wl,-z,relro -Wl,-z,now -Wl,--no-undefined-version)
if(QN_TR_SANITIZE)
    add_compile_options(-fsanitize=${QN_TR_SANITIZE} -fno-sanitize-recover=all -fno-omit-frame-pointer)
    add_link_options(-fsanitize=${QN_TR_SANITIZE})
    if(QN_TR_SANITIZE MATCHES "address" AND CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
        # A cancelled thread leaves its stack without undoing the instrumentation's poisoning; with poisoned stack
        # frames the next thread on that stack is reported for nothing. Heap and globals stay checked.
        add_compile_options(--param=asan-stack=0)
    endif()
elseif(CMAKE_BUILD_TYPE MATCHES "Rel")
    add_compile_definitions(_FORTIFY_SOURCE=3)
endif()

# Exports exactly the names that a version script lists.
function(qn_export_only target script)
    target_link_options(${target} PRIVATE "LINKER:--version-script=${CMAKE_CURRENT_SOURCE_DIR}/${script}"
                                          LINKER:--no-undefined)
    set_property(TARGET ${target} APPEND PROPERTY LINK_DEPENDS "${CMAKE_CURRENT_SOURCE_DIR}/${script}")
endfunction()
