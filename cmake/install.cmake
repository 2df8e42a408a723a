# The installed tree: bin, include, lib (both import libraries, the package of CMake, pkg-config), share/doc.
include(CMakePackageConfigHelpers)

install(FILES include/rcvlink.h include/rcvlink_c.h DESTINATION include)
install(TARGETS rcvlink rcvlink-cli rcvlink-sim RUNTIME DESTINATION bin ARCHIVE DESTINATION lib)
install(FILES ${RCVLINK_MSVC_LIBRARY} DESTINATION lib)

write_basic_package_version_file(rcvlink-config-version.cmake COMPATIBILITY SameMajorVersion)
install(FILES cmake/rcvlink-config.cmake ${CMAKE_CURRENT_BINARY_DIR}/rcvlink-config-version.cmake
        DESTINATION lib/cmake/rcvlink)
configure_file(cmake/rcvlink.pc.in rcvlink.pc @ONLY)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/rcvlink.pc DESTINATION lib/pkgconfig)

install(FILES README.md CHANGELOG.md LICENSE NOTICE SECURITY.md DESTINATION share/doc/rcvlink)
install(DIRECTORY docs DESTINATION share/doc/rcvlink)
install(FILES examples/download.cpp examples/list.c DESTINATION share/doc/rcvlink/examples)
