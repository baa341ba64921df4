# The install tree: bin/ (ostrand.dll and the runtime DLLs), include/ostrand/, lib/ (import library)
# and lib/cmake/ostrand/ (package configuration exporting ostrand::ostrand).
include(CMakePackageConfigHelpers)

install(TARGETS ostrand EXPORT ostrandTargets
    RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR}
    LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
    ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
    INCLUDES DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})
install(DIRECTORY include/ostrand DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}
    FILES_MATCHING PATTERN "*.h")
install(FILES "${CMAKE_BINARY_DIR}/generated/ostrand/version.h"
    DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/ostrand)
install(FILES ${OSTRAND_RUNTIME_DLLS} DESTINATION ${CMAKE_INSTALL_BINDIR})
if(EXISTS "${PROJECT_SOURCE_DIR}/data/DATA")
    install(DIRECTORY data/DATA DESTINATION ${CMAKE_INSTALL_BINDIR})
endif()

install(EXPORT ostrandTargets NAMESPACE ostrand:: DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/ostrand)
configure_package_config_file(cmake/ostrandConfig.cmake.in
    "${CMAKE_BINARY_DIR}/ostrandConfig.cmake"
    INSTALL_DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/ostrand)
write_basic_package_version_file("${CMAKE_BINARY_DIR}/ostrandConfigVersion.cmake"
    VERSION ${PROJECT_VERSION} COMPATIBILITY SameMajorVersion)
install(FILES "${CMAKE_BINARY_DIR}/ostrandConfig.cmake" "${CMAKE_BINARY_DIR}/ostrandConfigVersion.cmake"
    DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/ostrand)
