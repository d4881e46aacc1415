# What `cmake --install` puts where, and the Debian packages that cpack makes of it: `clipfile` with the programs, the module
# and what it needs to run, `libclipfile-dev` with what a host is built with.
include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

# Who installs has built what is installed, not every test.
set(CMAKE_SKIP_INSTALL_ALL_DEPENDENCY ON)

# The module and the libraries beside it are loaded by name of the file, not by the linker: their place is their own.
set(_private "${CMAKE_INSTALL_LIBDIR}/clipfile")
file(RELATIVE_PATH _from_programs "/${CMAKE_INSTALL_BINDIR}" "/${_private}")

set_target_properties(clipfile QxSettings PROPERTIES INSTALL_RPATH "$ORIGIN")
set_target_properties(receiver clipfile_program PROPERTIES INSTALL_RPATH "$ORIGIN/${_from_programs}")
install(TARGETS receiver clipfile_program RUNTIME DESTINATION "${CMAKE_INSTALL_BINDIR}" COMPONENT clipfile)
install(TARGETS clipfile QxSettings UtilityLib LIBRARY DESTINATION "${_private}" COMPONENT clipfile)

file(GLOB _pages "${PROJECT_SOURCE_DIR}/docs/man/*.1")
foreach(page IN LISTS _pages)
    get_filename_component(name "${page}" NAME)
    set(packed "${PROJECT_BINARY_DIR}/packaging/${name}.gz")
    add_custom_command(OUTPUT "${packed}"
        COMMAND "${CMAKE_COMMAND}" -E make_directory "${PROJECT_BINARY_DIR}/packaging"
        COMMAND gzip -9nc "${page}" > "${packed}" DEPENDS "${page}" VERBATIM)
    list(APPEND _packed_pages "${packed}")
endforeach()
set(_changes "${PROJECT_BINARY_DIR}/packaging/changelog.gz")
add_custom_command(OUTPUT "${_changes}"
    COMMAND gzip -9nc "${PROJECT_SOURCE_DIR}/CHANGELOG.md" > "${_changes}"
    DEPENDS "${PROJECT_SOURCE_DIR}/CHANGELOG.md" VERBATIM)
add_custom_target(clipfile_packed_texts ALL DEPENDS ${_packed_pages} "${_changes}")
install(FILES ${_packed_pages} DESTINATION "${CMAKE_INSTALL_MANDIR}/man1" COMPONENT clipfile)

set(_packaging "${PROJECT_SOURCE_DIR}/packaging")
install(FILES "${_packaging}/completion.bash" DESTINATION "${CMAKE_INSTALL_DATADIR}/bash-completion/completions"
    RENAME receiver COMPONENT clipfile)
# The name of the program that a completion is for is the name of its file.
install(FILES "${_packaging}/completion.bash" DESTINATION "${CMAKE_INSTALL_DATADIR}/bash-completion/completions"
    RENAME clipfile COMPONENT clipfile)
set(_unit "${PROJECT_BINARY_DIR}/packaging/clipfile-receiver@.service")
configure_file("${_packaging}/clipfile-receiver@.service.in" "${_unit}" @ONLY)
install(FILES "${_unit}" DESTINATION lib/systemd/system COMPONENT clipfile)
install(FILES "${_packaging}/clipfile.sysusers" DESTINATION lib/sysusers.d RENAME clipfile.conf COMPONENT clipfile)
install(FILES "${_packaging}/example.toml" DESTINATION "${CMAKE_INSTALL_DOCDIR}/examples" COMPONENT clipfile)
foreach(component clipfile libclipfile-dev)
    set(_doc "${CMAKE_INSTALL_DATADIR}/doc/${component}")
    install(FILES "${_packaging}/copyright" "${_changes}" DESTINATION "${_doc}" COMPONENT ${component})
endforeach()

install(DIRECTORY "${PROJECT_SOURCE_DIR}/include/" DESTINATION "${CMAKE_INSTALL_INCLUDEDIR}/clipfile"
    COMPONENT libclipfile-dev FILES_MATCHING PATTERN "*.h")
install(DIRECTORY "${PROJECT_SOURCE_DIR}/examples/" DESTINATION "${CMAKE_INSTALL_DATADIR}/doc/libclipfile-dev/examples"
    COMPONENT libclipfile-dev)
set(_config "${CMAKE_INSTALL_LIBDIR}/cmake/clipfile")
set(CLIPFILE_MODULE_FILE "${_private}/libclipfile.so")
configure_package_config_file("${_packaging}/clipfileConfig.cmake.in" "${PROJECT_BINARY_DIR}/packaging/clipfileConfig.cmake"
    INSTALL_DESTINATION "${_config}" PATH_VARS CMAKE_INSTALL_INCLUDEDIR CLIPFILE_MODULE_FILE)
write_basic_package_version_file("${PROJECT_BINARY_DIR}/packaging/clipfileConfigVersion.cmake"
    COMPATIBILITY SameMajorVersion)
install(FILES "${PROJECT_BINARY_DIR}/packaging/clipfileConfig.cmake"
    "${PROJECT_BINARY_DIR}/packaging/clipfileConfigVersion.cmake" DESTINATION "${_config}" COMPONENT libclipfile-dev)
file(RELATIVE_PATH CLIPFILE_PREFIX_FROM_PKGCONFIG "/${CMAKE_INSTALL_LIBDIR}/pkgconfig" "/")
configure_file("${_packaging}/clipfile.pc.in" "${PROJECT_BINARY_DIR}/packaging/clipfile.pc" @ONLY)
install(FILES "${PROJECT_BINARY_DIR}/packaging/clipfile.pc" DESTINATION "${CMAKE_INSTALL_LIBDIR}/pkgconfig"
    COMPONENT libclipfile-dev)

set(CPACK_GENERATOR DEB TGZ)
set(CPACK_PACKAGE_NAME clipfile)
set(CPACK_PACKAGE_CONTACT "clipfile maintainers <maintainers@clipfile.invalid>")
set(CPACK_COMPONENTS_ALL clipfile libclipfile-dev)
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
set(CPACK_THREADS 2)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_COMPRESSION_TYPE xz)
set(CPACK_DEBIAN_CLIPFILE_PACKAGE_NAME clipfile)
set(CPACK_DEBIAN_CLIPFILE_PACKAGE_SECTION video)
set(CPACK_DEBIAN_CLIPFILE_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS
    "${PROJECT_BINARY_DIR}/libs/QxSettings" "${PROJECT_BINARY_DIR}/libs/UtilityLib")
# Loaded when it is needed: the linker knows nothing of them.
set(CPACK_DEBIAN_CLIPFILE_PACKAGE_DEPENDS "libavfilter8")
set(CPACK_DEBIAN_CLIPFILE_PACKAGE_RECOMMENDS "libsmbclient, systemd")
set(CPACK_DEBIAN_CLIPFILE_PACKAGE_CONTROL_EXTRA "${_packaging}/postinst;${_packaging}/prerm;${_packaging}/postrm")
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION TRUE)
set(CPACK_DEBIAN_CLIPFILE_DESCRIPTION "recorder of live broadcast streams to MP4 files
Records live H.264, AAC and timed metadata to rotating MP4 files,
frame-accurately on record commands. This package has the receiver, which
takes streams from the network, the output module that it loads, and the
program clipfile, which looks into recordings, verifies and recovers them.")
set(CPACK_DEBIAN_LIBCLIPFILE-DEV_PACKAGE_NAME libclipfile-dev)
set(CPACK_DEBIAN_LIBCLIPFILE-DEV_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_LIBCLIPFILE-DEV_PACKAGE_DEPENDS "clipfile (= ${PROJECT_VERSION})")
set(CPACK_DEBIAN_LIBCLIPFILE-DEV_DESCRIPTION "headers for hosts of the recorder's output module
Interfaces between a host and the output module that records live streams,
with a CMake package, a pkg-config file and an example host.")
include(CPack)
