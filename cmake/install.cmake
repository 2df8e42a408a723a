# The installed tree: bin, include, lib (both import libraries, the package of CMake, pkg-config), share/doc,
# share/rcvlink (the binding for C#).
include(CMakePackageConfigHelpers)

install(FILES include/rcvlink.h include/rcvlink.hpp include/rcvlink_c.h DESTINATION include)
install(TARGETS rcvlink rcvlink-cli rcvlink-sim RUNTIME DESTINATION bin ARCHIVE DESTINATION lib)
install(FILES ${RCVLINK_MSVC_LIBRARY} DESTINATION lib)

write_basic_package_version_file(rcvlink-config-version.cmake COMPATIBILITY SameMajorVersion)
install(FILES cmake/rcvlink-config.cmake ${CMAKE_CURRENT_BINARY_DIR}/rcvlink-config-version.cmake
        DESTINATION lib/cmake/rcvlink)
configure_file(cmake/rcvlink.pc.in rcvlink.pc @ONLY)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/rcvlink.pc DESTINATION lib/pkgconfig)

install(FILES CHANGELOG.md LICENSE NOTICE SECURITY.md DESTINATION share/doc/rcvlink)
# The folders are those of the sources, so that the documents find each other.
# What is for those who change the library stays out.
install(DIRECTORY docs DESTINATION share/doc/rcvlink
        REGEX "/(adding-a-family|architecture|performance|testing)\\.md$" EXCLUDE)
install(FILES simulator/README.md DESTINATION share/doc/rcvlink/simulator)
install(DIRECTORY examples DESTINATION share/doc/rcvlink PATTERN CMakeLists.txt EXCLUDE)
install(FILES kit/examples.cmake DESTINATION share/doc/rcvlink/examples RENAME CMakeLists.txt)
install(DIRECTORY bindings/csharp DESTINATION share/rcvlink)
