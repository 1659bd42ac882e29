# cmake --install gives include/, bin/KelvraSDK.dll, lib/libKelvraSDK.dll.a and a CMake package,
# so that a host writes find_package(KelvraSDK) and links KelvraSDK::KelvraSDK.
include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

set(KELVRA_PACKAGE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/KelvraSDK)

install(TARGETS KelvraSDK EXPORT KelvraSDKTargets
    RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR}
    ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR})
install(DIRECTORY ${PROJECT_SOURCE_DIR}/include/ DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}
    FILES_MATCHING PATTERN "*.h")
install(EXPORT KelvraSDKTargets NAMESPACE KelvraSDK:: DESTINATION ${KELVRA_PACKAGE_DIR})

configure_package_config_file(${CMAKE_CURRENT_LIST_DIR}/KelvraSDKConfig.cmake.in
    ${PROJECT_BINARY_DIR}/KelvraSDKConfig.cmake
    INSTALL_DESTINATION ${KELVRA_PACKAGE_DIR})
write_basic_package_version_file(${PROJECT_BINARY_DIR}/KelvraSDKConfigVersion.cmake
    COMPATIBILITY SameMinorVersion)
install(FILES ${PROJECT_BINARY_DIR}/KelvraSDKConfig.cmake ${PROJECT_BINARY_DIR}/KelvraSDKConfigVersion.cmake
    DESTINATION ${KELVRA_PACKAGE_DIR})
