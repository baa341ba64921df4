# Shared build settings of the library, its tests, benchmarks and examples.

function(ostrand_warnings target)
    target_compile_options(${target} PRIVATE -Wall -Wextra)
    if(OSTRAND_WERROR)
        target_compile_options(${target} PRIVATE -Werror)
    endif()
endfunction()

# Every library source names itself in the exceptions it throws: its base name, without folder and
# extension ("File", "CommPort").
function(ostrand_name_sources)
    foreach(src IN LISTS ARGN)
        get_filename_component(base "${src}" NAME_WE)
        set_property(SOURCE "${src}" APPEND PROPERTY COMPILE_DEFINITIONS "OSTRAND_SOURCE_FILE=\"${base}\"")
    endforeach()
endfunction()

# The MinGW runtime DLLs that the library, its tests and its users share.
set(OSTRAND_RUNTIME_DLLS "")
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND WIN32)
    foreach(dll libstdc++-6.dll libgcc_s_seh-1.dll libwinpthread-1.dll)
        execute_process(COMMAND ${CMAKE_CXX_COMPILER} -print-file-name=${dll}
                        OUTPUT_VARIABLE path OUTPUT_STRIP_TRAILING_WHITESPACE)
        if(NOT IS_ABSOLUTE "${path}")
            # The posix-thread runtime keeps libwinpthread in the target sysroot.
            find_file(path_${dll} ${dll} PATHS /usr/${OSTRAND_MINGW_PREFIX}/lib NO_DEFAULT_PATH)
            set(path "${path_${dll}}")
        endif()
        if(NOT EXISTS "${path}")
            message(FATAL_ERROR "MinGW runtime ${dll} not found")
        endif()
        list(APPEND OSTRAND_RUNTIME_DLLS "${path}")
    endforeach()
endif()

# Puts the runtime DLLs beside the targets in the build tree (one copy per output folder).
function(ostrand_copy_runtime_dlls target)
    foreach(dll IN LISTS OSTRAND_RUNTIME_DLLS)
        add_custom_command(TARGET ${target} POST_BUILD
            COMMAND ${CMAKE_COMMAND} -E copy_if_different "${dll}" "$<TARGET_FILE_DIR:${target}>"
            VERBATIM)
    endforeach()
endfunction()
